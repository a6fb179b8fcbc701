#include "params/parfile.h"

#include <gtest/gtest.h>
#include <sys/stat.h>

#include <unistd.h>

#include <charconv>
#include <cstdint>
#include <string>
#include <vector>

#include "common/temp_dir.h"

namespace karnet {
namespace {

// Parameter n of occurrence `occurrence` of keyword read as an integer ('i'), a
// float ('f'), a text ('s') or a file name ('F'), shown as text (a float in its
// shortest exact form). "FAIL" when it does not convert, after checking that
// kParErrorConvert is pending and the output was left alone.
std::string get(const ParBlock* s, const char* keyword, int n, char kind, int occurrence = 1) {
  std::int32_t i = 11;
  float f = 11;
  const char* text = "unchanged";
  bool ok = false;
  if (kind == 'i') ok = parGetParam(s, keyword, &i, occurrence, n) != 0;
  if (kind == 'f') ok = parGetParam(s, keyword, &f, occurrence, n) != 0;
  if (kind == 'F') ok = parGetParamFilename(s, keyword, &text, occurrence, n) != 0;
  if (kind == 's') {
    text = parGetString(parParamByNum(parKeywordByNameNum(s, keyword, occurrence), n));
    ok = parPeekErrorGlb() == kParOk;
  }
  if (!ok) {
    EXPECT_EQ(parPeekErrorGlb(), kParErrorConvert) << keyword << " " << n;
    // A failed text read gives "", never null.
    EXPECT_TRUE(i == 11 && f == 11 && text == std::string(kind == 's' ? "" : "unchanged"));
    return "FAIL";
  }
  char buffer[32];
  if (kind == 'f') return std::string(buffer, std::to_chars(buffer, buffer + sizeof buffer, f).ptr);
  return kind == 'i' ? std::to_string(i) : text;
}

// Loads text as a file named "case.pfs"; the file is released by the fixture.
class ParFileTest : public ::testing::Test {
 protected:
  ~ParFileTest() override { parClose(&file_); }

  ParFile* load(const std::string& text) {
    parClose(&file_);
    file_ = parLoadFile(dir_.write("case.pfs", text).c_str(), 1);
    return file_;
  }

  // Loads keyword lines (from line 3 on) into section [S] of target [T].
  const ParBlock* loadSection(const std::string& lines) {
    EXPECT_NE(load("[T]\n [S]\n" + lines + " EndSect\nEndSect\n"), nullptr) << parErrorTextGlb();
    return parSectionByNameNum(parTargetByNameNum(file_, "T", 1), "S", 1);
  }

  test::TempDir dir_;
  ParFile* file_ = nullptr;
};

// Blocks nest and keywords repeat; blanks, comments and line ends are free.
TEST_F(ParFileTest, StructureOfAWellFormedFile) {
  ASSERT_NE(load("\xEF\xBB\xBF// a comment line after a byte-order mark\n"
                 "[RUN]  // trailing comment\n"
                 "   [A]\n"
                 "      Key = 1\n"
                 "      Key = 2, 3\n"
                 "\t\t[INNER]\r\n"
                 "\t\t\tA=1,2//no blanks needed\r\n"
                 "\t\t\tB   =   'it // is text'   ,   |dir//f.txt|  // comment\r\n"
                 "\r\n"
                 "   \t  \r\n"
                 "\t\t\tC = word_1\r\n"
                 "\t\tEndSect// INNER\r\n"
                 "   EndSect\n"
                 "EndSect"),  // no line end at the end of the file
            nullptr)
      << parErrorTextGlb();
  const ParBlock* run1 = parTargetByNameNum(file_, "RUN", 1);
  ASSERT_NE(run1, nullptr);
  // Sections are not targets.
  EXPECT_EQ(parTargetByNameNum(file_, "A", 1), nullptr);
  const ParBlock* a1 = parSectionByNameNum(run1, "A", 1);
  ASSERT_NE(a1, nullptr);
  // Only sections directly inside the block are found.
  EXPECT_EQ(parSectionByNameNum(run1, "INNER", 1), nullptr);
  const ParBlock* inner = parSectionByNameNum(a1, "INNER", 1);
  EXPECT_EQ(get(inner, "A", 2, 'i'), "2");
  EXPECT_EQ(get(inner, "B", 1, 's'), "it // is text");
  EXPECT_EQ(get(inner, "B", 2, 'F'), dir_.path() + "/dir//f.txt");
  EXPECT_EQ(get(inner, "C", 1, 's'), "word_1");

  EXPECT_EQ(get(a1, "Key", 1, 'i'), "1");
  EXPECT_EQ(get(a1, "Key", 2, 'i', 2), "3");
  EXPECT_EQ(parKeywordLine(parKeywordByNameNum(inner, "C", 1)), 11);  // CRLF lines count once

  // Empty and comment-only files are well formed, without targets.
  for (const char* text : {"", "// nothing\n\n   // at all\n"}) {
    ASSERT_NE(load(text), nullptr) << parErrorTextGlb();
    EXPECT_EQ(parTargetByNameNum(file_, "T", 1), nullptr);
  }
}

// Each malformed line is reported as "case.pfs:LINE: REASON". A text without
// a line end is the line after "[T]" in "[T]\n  TEXT\nEndSect\n".
TEST_F(ParFileTest, SyntaxErrorsNameLineAndReason) {
  struct Case {
    std::string text;
    std::string error;  // after "case.pfs:"
  };
  const Case cases[] = {
      {"[T]\n  [S]\n", "2: block S is not closed (EndSect missing)"},
      {"[T]\nEndSect\nEndSect\n", "3: EndSect without an open block"},
      {"garbage", "2: expected '=' after keyword 'garbage', found the line end"},
      {"* = 1", "2: expected '[NAME]', 'EndSect' or 'NAME = value', found '* = 1'"},
      {"A = 'open", "2: unterminated text (closing ' missing) in keyword A"},
      {"[T]\n\n  A = 1.5.2\nEndSect\n", "3: invalid number '1.5.2' in keyword A"},
      {"A = 1\n", "1: keyword A outside of any block"},
      {"A =", "2: keyword A has no value"},
      {"A = 1,", "2: missing value after ',' in keyword A"},
      {"A = 12 pts filter", "2: expected ',' between the values of keyword A, found 'pts filter'"},
      {"[T] x\nEndSect\n", "1: unexpected text after [T]: 'x'"},
      {"[T\nEndSect\n", "1: expected ']' after block name 'T', found the line end"},
      {"[]\nEndSect\n", "1: missing or invalid block name in ']'"},
      {std::string("A = 1\0", 6), "2: NUL byte in the line"},
      {"A = \x01\x7f", "2: invalid value '\\x01\\x7F' in keyword A"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.text);
    const bool line = c.text.find('\n') == std::string::npos;
    EXPECT_EQ(load(line ? "[T]\n  " + c.text + "\nEndSect\n" : c.text), nullptr);
    EXPECT_EQ(parPeekErrorGlb(), kParErrorSyntax);
    EXPECT_EQ(parErrorTextGlb(), "case.pfs:" + c.error);
  }
}

TEST_F(ParFileTest, LoadFailures) {
  EXPECT_EQ(parLoadFile(dir_.path().c_str(), 1), nullptr);  // a directory
  EXPECT_EQ(parPeekErrorGlb(), kParErrorOpen);
  // The name in the message is the base name, readable, on one line.
  EXPECT_EQ(parLoadFile(dir_.file("m\xC3\xA5ling\nny.pfs").c_str(), 1), nullptr);
  EXPECT_STREQ(parErrorTextGlb(), "Can't open m\xC3\xA5ling\\x0Any.pfs");

  // A file larger than the limit is refused before it is parsed (sparse, so
  // it takes no disk space).
  const std::string big = dir_.write("big.pfs", "[T]\n");
  ASSERT_EQ(truncate(big.c_str(), static_cast<off_t>(kParMaxFileSize + 1)), 0);
  EXPECT_EQ(parLoadFile(big.c_str(), 1), nullptr);
  EXPECT_EQ(parPeekErrorGlb(), kParErrorTooLarge);
  EXPECT_EQ(std::string(parErrorTextGlb()).rfind("Can't open big.pfs", 0), 0u);

  // A FIFO without a writer would block the open, a device never ends: both
  // are refused at once.
  const std::string fifo = dir_.file("fifo.pfs");
  ASSERT_EQ(mkfifo(fifo.c_str(), 0600), 0);
  EXPECT_EQ(parLoadFile(fifo.c_str(), 1), nullptr);
  EXPECT_STREQ(parErrorTextGlb(), "Can't open fifo.pfs (not a regular file)");
  EXPECT_EQ(parLoadFile("/dev/zero", 1), nullptr);
  EXPECT_STREQ(parErrorTextGlb(), "Can't open zero (not a regular file)");
}

TEST_F(ParFileTest, Conversions) {
  const ParBlock* s = loadSection(
      "  I = 20, -7, +3, 2147483647, -2147483648\n"
      "  Big = 2147483648, -2147483649, 99999999999999999999\n"
      "  F = -1.5, 2.5e-3, .5, 7., 1E2, 3.4e38, 1e-50\n"
      "  NotInt = 1.5, 1e3, 1.0, 'text', word, |f.txt|\n"
      "  NotFloat = 1e39, -1e400, 'x', word, |f|\n"
      "  Text = 'UTM-32', '', '12 pts filter', bilinear, 5, |a.txt|\n"
      "  Files = |obs.txt|, |./sub/bathy.nc|, |/abs/path.nc|, ||, 'quoted', |../up.nc|\n");
  ASSERT_NE(s, nullptr);
  const std::string d = dir_.path() + "/", x = "FAIL";
  struct Case {
    const char* keyword;
    char kind;
    std::vector<std::string> expected;  // parameter 1, 2, ...
  };
  const Case cases[] = {
      {"I", 'i', {"20", "-7", "3", "2147483647", "-2147483648"}},
      {"I", 'f', {"20", "-7", "3", "2147483648", "-2147483648"}},  // integers are floats
      {"Big", 'i', {x, x, x}},
      {"F", 'f', {"-1.5", "0.0025", "0.5", "7", "100", "3.4e+38", "0"}},
      {"NotInt", 'i', {x, x, x, x, x, x}},
      {"NotFloat", 'f', {x, x, x, x, x}},
      {"Text", 's', {"UTM-32", "", "12 pts filter", "bilinear", x, x}},
      // A quoted text is not a file name.
      {"Files", 'F', {d + "obs.txt", d + "sub/bathy.nc", "/abs/path.nc", "", x, d + "../up.nc"}},
  };
  for (const Case& c : cases) {
    for (int n = 1; n <= static_cast<int>(c.expected.size()); ++n) {
      SCOPED_TRACE(std::string(c.keyword) + " " + c.kind + std::to_string(n));
      EXPECT_EQ(get(s, c.keyword, n, c.kind), c.expected[n - 1]);
    }
  }
}

// A relative parameter-file path gives file names relative to the same place.
TEST_F(ParFileTest, FileNamesRelativeToARelativeParameterFile) {
  dir_.write("rel.pfs", "[T]\n [S]\n  F = |data/x.txt|\n EndSect\nEndSect\n");
  const std::string base = dir_.path().substr(dir_.path().rfind('/') + 1);
  char* previous = getcwd(nullptr, 0);
  ASSERT_EQ(chdir(dir_.path().c_str()), 0);
  ParFile* parent = parLoadFile(("../" + base + "/rel.pfs").c_str(), 1);
  ASSERT_EQ(chdir(previous), 0);
  free(previous);
  ASSERT_NE(parent, nullptr);
  EXPECT_EQ(get(parSectionByNameNum(parTargetByNameNum(parent, "T", 1), "S", 1), "F", 1, 'F'),
            "../" + base + "/data/x.txt");
  parClose(&parent);
}

// Lists as ZRange and MaxExtrapolationDistance are read (success and the count
// message are checked with the run parameters).
TEST_F(ParFileTest, ListParametersAreStoredAllOrNothing) {
  const ParBlock* s = loadSection("  Two = 0, 19\n  Half = 7, 1.5\n");
  ASSERT_NE(s, nullptr);
  std::int32_t a = -1, b = -1;
  // The first value converts, the second does not.
  EXPECT_FALSE(parGetListParam(s, "Half", 1, "ii", &a, &b));
  EXPECT_EQ(parPeekErrorGlb(), kParErrorConvert);
  // Format letters and output types must agree.
  EXPECT_FALSE(parGetListParam(s, "Two", 1, "if", &a, &b));
  EXPECT_EQ(parPeekErrorGlb(), kParErrorArgument);
  EXPECT_TRUE(a == -1 && b == -1);
}

TEST_F(ParFileTest, MissingThingsAreReportedWhereTheyBelong) {
  ASSERT_NE(load("[T]\n  [S]\n    K = 1\n  EndSect\n  [S2]\n  EndSect\nEndSect\n// end\n"),
            nullptr);
  const ParBlock* t = parTargetByNameNum(file_, "T", 1);
  ASSERT_NE(t, nullptr);
  EXPECT_EQ(parSectionByNameNum(t, "S", 2), nullptr);
  EXPECT_STREQ(parErrorTextGlb(), "case.pfs:7: occurrence 2 of section [S] not found in [T]");
  const ParBlock* s = parSectionByNameNum(t, "S", 1);
  float f = 0;
  EXPECT_FALSE(parGetParam(s, "K", &f, 1, 2));
  EXPECT_STREQ(parErrorTextGlb(), "case.pfs:3: keyword K has no parameter 2 (it has 1)");

  // A successful call clears the pending error.
  EXPECT_TRUE(parGetParam(s, "K", &f, 1, 1));
  EXPECT_EQ(parPeekErrorGlb(), kParOk);
  EXPECT_STREQ(parErrorTextGlb(), "");
}

}  // namespace
}  // namespace karnet
