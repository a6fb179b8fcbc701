// Run mode, parameter file and log file name from the command-line arguments.
#include "control/command_line.h"

#include <gtest/gtest.h>

#include <cstring>
#include <string>
#include <vector>

namespace karnet {
namespace {

struct Selection {
  int valid;
  std::string name;
};

Selection select(const std::vector<const char*>& arguments) {
  char name[kFileNameSize];
  std::memset(name, 'x', sizeof name);
  const int valid =
      selectParameterFile(static_cast<int>(arguments.size()), arguments.data(), name);
  return {valid, name};
}

TEST(CommandLineTest, HostModeIsChosenByAnyArgumentThatIsExactlyApv) {
  struct Case {
    std::vector<const char*> arguments;
    bool host;
  };
  const Case cases[] = {
      {{"case.pfs"}, false},          {{"//apv", "case.pfs"}, true},
      {{"case.pfs", "//APV"}, true},  {{"-debug", "//Apv", "case.pfs"}, true},
      {{"/apv", "case.pfs"}, false},  {{"//apvx", "case.pfs"}, false},
      {{}, false},
  };
  for (const Case& c : cases) {
    EXPECT_EQ(hasHostModeArgument(static_cast<int>(c.arguments.size()), c.arguments.data()),
              c.host)
        << (c.arguments.empty() ? "(none)" : c.arguments.back());
  }
}

TEST(CommandLineTest, ParameterFileIsTheLastArgumentThatIsNoSwitch) {
  struct Case {
    std::vector<const char*> arguments;
    int valid;
    const char* name;
  };
  const Case cases[] = {
      {{"case.pfs"}, 1, "case.pfs"},
      {{"//apv", "case.pfs"}, 1, "case.pfs"},
      {{"-debug", "case.pfs"}, 1, "case.pfs"},
      {{"-DEBUG", "//APV", "runs/case.pfs"}, 1, "runs/case.pfs"},
      {{"a.pfs", "b.pfs"}, 1, "b.pfs"},
      {{"case.pfs", "//apv"}, 0, "case.pfs"},
      {{"case.pfs", "-debug"}, 0, "case.pfs"},
      {{"case.pfs", ""}, 0, "case.pfs"},
      {{"-x", "case.pfs"}, 1, "case.pfs"},
      // One empty argument: the name stays empty and is the last argument.
      {{""}, 1, ""},
      // No argument at all names no parameter file.
      {{}, 0, ""},
      {{"//apv"}, 0, ""},
  };
  for (const Case& c : cases) {
    const Selection selection = select(c.arguments);
    const std::string label = c.arguments.empty() ? "(none)" : c.arguments.back();
    EXPECT_EQ(selection.valid, c.valid) << label;
    EXPECT_EQ(selection.name, c.name) << label;
  }
}

TEST(CommandLineTest, ParameterFileNameMustFitItsBuffer) {
  const std::string fits(259, 'p');
  Selection selection = select({fits.c_str()});
  EXPECT_EQ(selection.valid, 1);
  EXPECT_EQ(selection.name, fits);

  const std::string tooLong(260, 'p');
  selection = select({tooLong.c_str()});
  EXPECT_EQ(selection.valid, 0);
  EXPECT_EQ(selection.name, fits);  // cut, but terminated
}

TEST(CommandLineTest, LogFileLiesBesideTheParameterFile) {
  struct Case {
    const char* parameterFile;
    const char* log;
  };
  const Case cases[] = {
      {"case1.pfs", "case1.log"},
      {"/runs/case1.pfs", "/runs/case1.log"},
      {"../runs/case1.PFS", "../runs/case1.log"},
      {"runs.d/case1", "runs.d/case1.log"},
      {"runs/case.v2.pfs", "runs/case.v2.log"},
      {"runs/.pfs", "runs/.log"},
      {"", ".log"},
  };
  for (const Case& c : cases) {
    char log[kFileNameSize] = "unchanged";
    EXPECT_EQ(makeLogFileName(c.parameterFile, log), 1) << c.parameterFile;
    EXPECT_STREQ(log, c.log) << c.parameterFile;
  }
}

TEST(CommandLineTest, LogFileNameThatDoesNotFitIsNotMade) {
  char log[kFileNameSize] = "unchanged";
  const std::string longest = std::string(251, 'd') + "/a.pfs";  // 257 characters
  EXPECT_EQ(makeLogFileName(longest.c_str(), log), 1);
  EXPECT_EQ(std::string(log), std::string(251, 'd') + "/a.log");

  const std::string withoutExtension(256, 'd');  // 256 + ".log" leaves no room for the end
  EXPECT_EQ(makeLogFileName(withoutExtension.c_str(), log), 0);
  EXPECT_STREQ(log, "");
}

}  // namespace
}  // namespace karnet
