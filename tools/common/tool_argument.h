#ifndef KARNET_TOOLS_COMMON_TOOL_ARGUMENT_H_
#define KARNET_TOOLS_COMMON_TOOL_ARGUMENT_H_

#include <string>

namespace karnet {

// One command-line argument of the tools. A long option may carry its value attached
// ("--spacing=5000") or in the next argument ("--spacing 5000").
struct ToolArgument {
  std::string name;   // the argument without an attached "=value"
  std::string value;  // the attached value
  bool attached = false;
};

inline ToolArgument splitToolArgument(const char* text) {
  ToolArgument a;
  a.name = text;
  if (a.name.size() > 2 && a.name.compare(0, 2, "--") == 0) {
    const std::size_t eq = a.name.find('=');
    if (eq != std::string::npos) {
      a.value = a.name.substr(eq + 1);
      a.name.resize(eq);
      a.attached = true;
    }
  }
  return a;
}

// The option's value: the attached one, else the next argument (index moves past it).
// False when there is none.
inline bool toolOptionValue(const ToolArgument& a, int argc, const char* const* argv, int& index,
                            std::string* out) {
  if (a.attached) {
    *out = a.value;
    return true;
  }
  if (index + 1 >= argc) return false;
  *out = argv[++index];
  return true;
}

}  // namespace karnet

#endif  // KARNET_TOOLS_COMMON_TOOL_ARGUMENT_H_
