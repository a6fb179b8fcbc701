// The parameter-file library and the run's parameter reader on arbitrary
// bytes: parsing, every lookup and conversion the reader makes, and the
// library calls on their own with names and numbers taken from the input.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <string>

#include "fuzz/memory_file.h"
#include "params/parfile.h"
#include "params/parfile_model.h"
#include "params/run_parameters.h"

namespace {

// A text field must always be terminated within its buffer.
void requireTerminated(const char* field, std::size_t size) {
  if (std::memchr(field, '\0', size) == nullptr) std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  using namespace karnet;
  const fuzz::MemoryFile file(data, size);

  // The reader as the run calls it.
  RunParameters p{};
  readParameterFile(file.path(), p);
  requireTerminated(p.inputFiles.DataFileName, sizeof p.inputFiles.DataFileName);
  requireTerminated(p.inputFiles.FileName, sizeof p.inputFiles.FileName);
  requireTerminated(p.inputFiles.Projection, sizeof p.inputFiles.Projection);
  requireTerminated(p.outputData.FileName, sizeof p.outputData.FileName);
  requireTerminated(p.outputData.Title, sizeof p.outputData.Title);

  // The library's lookups over whatever blocks and keywords the input has.
  ParFile* loaded = parLoadFile(file.path(), 1);
  if (loaded == nullptr) {
    if (parPeekErrorGlb() == kParOk) std::abort();  // a failure must say so
    return 0;
  }
  for (const ParBlock* target : loaded->targets) {
    if (parTargetByNameNum(loaded, target->name.c_str(), 1) == nullptr) std::abort();
    for (const ParBlock* section : target->sections) {
      for (const ParKeyword& keyword : section->keywords) {
        const char* name = keyword.name.c_str();
        const int count = static_cast<int>(keyword.params.size());
        for (int number = 1; number <= count + 1; ++number) {
          float f = 0;
          std::int32_t i = 0;
          const char* text = nullptr;
          parGetParam(section, name, &f, 1, number);
          parGetParam(section, name, &i, 1, number);
          parGetParamFilename(section, name, &text, 1, number);
          if (ParKeyword* k = parKeywordByNameNum(section, name, 1)) {
            if (ParParam* param = parParamByNum(k, number)) {
              if (parGetString(param) == nullptr) std::abort();
            }
          }
        }
        float a = 0, b = 0;
        std::int32_t c = 0, d = 0;
        parGetListParam(section, name, 1, "ff", &a, &b);
        parGetListParam(section, name, 1, "ii", &c, &d);
      }
    }
  }
  parClose(&loaded);
  if (loaded != nullptr) std::abort();
  return 0;
}
