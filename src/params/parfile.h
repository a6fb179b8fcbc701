#ifndef KARNET_PARAMS_PARFILE_H_
#define KARNET_PARAMS_PARFILE_H_

#include <cstddef>
#include <cstdint>

// The parameter-file library: loads a pfs file into memory and looks up its
// targets, sections, keywords and parameters by name and occurrence number.
//
//   // comment
//   [TARGET]
//      [SECTION]
//         Keyword = 12, -1.5e3, 'a text', |file/name.txt|, bareword
//      EndSect  // SECTION
//   EndSect
//
// Names are matched exactly. Occurrences and parameter numbers count from 1.
// Every call that fails sets the pending error (parPeekErrorGlb) and its text
// "NAME:LINE: REASON"; every lookup or read first clears it.

namespace karnet {

struct ParFile;     // a loaded parameter file
struct ParBlock;    // a target or a section
struct ParKeyword;  // one occurrence of a keyword
struct ParParam;    // one parameter of a keyword

enum ParError : int {
  kParOk = 0,
  kParErrorOpen = 1,      // the file cannot be read
  kParErrorSyntax = 2,    // the file is not a well-formed parameter file
  kParErrorTooLarge = 3,  // the file exceeds kParMaxFileSize
  kParErrorMissing = 4,   // target, section, keyword or parameter not there
  kParErrorConvert = 5,   // the parameter is not of the requested kind or range
  kParErrorArgument = 6,  // null handle, bad occurrence or format
};

// Parameter files are small; anything larger is refused before parsing.
inline constexpr std::size_t kParMaxFileSize = std::size_t{64} << 20;

// Loads and parses the file. Null on failure (kParErrorOpen, kParErrorSyntax
// or kParErrorTooLarge pending). flags is reserved and ignored.
ParFile* parLoadFile(const char* path, int flags);
// Releases the file and sets *file to null; leaves the pending error alone.
void parClose(ParFile** file);

ParBlock* parTargetByNameNum(const ParFile* file, const char* name, int occurrence);
// A section directly inside block (a target or a section).
ParBlock* parSectionByNameNum(const ParBlock* block, const char* name, int occurrence);
ParKeyword* parKeywordByNameNum(const ParBlock* block, const char* name, int occurrence);
ParParam* parParamByNum(const ParKeyword* keyword, int number);

// The text of a quoted text or a bare word; "" (never null) with
// kParErrorConvert pending for any other parameter.
const char* parGetString(const ParParam* param);

// Parameter `number` of occurrence `occurrence` of the keyword, converted.
// Non-zero on success; on failure 0 and *value untouched.
// Integers: digits only (optional sign), within 32 bits.
// Floats: any number within the float range (tiny values become 0).
int parGetParam(const ParBlock* section, const char* keyword, float* value, int occurrence,
                int number);
int parGetParam(const ParBlock* section, const char* keyword, std::int32_t* value,
                int occurrence, int number);
// A file name between | |, resolved against the parameter file's directory.
// The text lives as long as the file is loaded.
int parGetParamFilename(const ParBlock* section, const char* keyword, const char** value,
                        int occurrence, int number);

// One output of parGetListParam: 'i' int32, 'f' float, 's' text.
struct ParListOut {
  char kind;
  void* target;
};
// Reads every parameter of the keyword occurrence; format has one letter per
// parameter ('i', 'f' or 's') and must match the count exactly. Either every
// output is stored (non-zero) or none is (0).
int parGetListParamOuts(const ParBlock* section, const char* keyword, int occurrence,
                        const char* format, const ParListOut* outs, std::size_t count);

namespace par_detail {
inline ParListOut listOut(std::int32_t* p) { return {'i', p}; }
inline ParListOut listOut(float* p) { return {'f', p}; }
inline ParListOut listOut(const char** p) { return {'s', p}; }
}  // namespace par_detail

// parGetListParam(section, "ZRange", 1, "ii", &first, &last): the outputs'
// types must agree with the format letters, else the call fails.
template <typename... Outs>
int parGetListParam(const ParBlock* section, const char* keyword, int occurrence,
                    const char* format, Outs*... outs) {
  const ParListOut list[] = {par_detail::listOut(outs)..., ParListOut{'\0', nullptr}};
  return parGetListParamOuts(section, keyword, occurrence, format, list, sizeof...(Outs));
}

// The pending error code (kParOk when the last call succeeded); not cleared.
int parPeekErrorGlb();
// The text of the pending error ("" when none).
const char* parErrorTextGlb();
void parClearErrorGlb();

// Where things are, for messages of the caller: the file's display name (base
// name and extension) and the line of a keyword occurrence (0 for null).
const char* parFileName(const ParFile* file);
int parKeywordLine(const ParKeyword* keyword);

}  // namespace karnet

#endif  // KARNET_PARAMS_PARFILE_H_
