#include "params/parfile.h"

#include <gtest/gtest.h>

#include <sys/stat.h>
#include <unistd.h>

#include <cstdint>
#include <string>

#include "par_test_util.h"

namespace karnet {
namespace {

using test::TempDir;

// The text of parameter `number` of keyword occurrence 1, or null with the
// library error pending.
const char* textOf(const ParBlock* section, const char* keyword, int number) {
  const ParKeyword* found = parKeywordByNameNum(section, keyword, 1);
  if (found == nullptr) return nullptr;
  const ParParam* param = parParamByNum(found, number);
  if (param == nullptr) return nullptr;
  const char* text = parGetString(param);
  return parPeekErrorGlb() == kParOk ? text : nullptr;
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

  // The syntax error of text: the pending error text after a failed load.
  std::string syntaxError(const std::string& text) {
    EXPECT_EQ(load(text), nullptr) << text;
    EXPECT_EQ(parPeekErrorGlb(), kParErrorSyntax);
    return parErrorTextGlb();
  }

  const ParBlock* section(const char* target, const char* name) {
    const ParBlock* t = parTargetByNameNum(file_, target, 1);
    return t == nullptr ? nullptr : parSectionByNameNum(t, name, 1);
  }

  TempDir dir_;
  ParFile* file_ = nullptr;
};

TEST_F(ParFileTest, StructureOfAWellFormedFile) {
  ASSERT_NE(load("// a comment line\n"
                 "[RUN]  // trailing comment\n"
                 "   [A]\n"
                 "      Key = 1\n"
                 "      Key = 2, 3\n"
                 "      [INNER]\n"
                 "         Deep = 'x'\n"
                 "      EndSect // INNER\n"
                 "   EndSect\n"
                 "   [A]\n"
                 "      Key = 4\n"
                 "   EndSect\n"
                 "EndSect\n"
                 "[RUN]\n"
                 "EndSect\n"
                 "[OTHER]\n"
                 "EndSect\n"),
            nullptr)
      << parErrorTextGlb();
  EXPECT_EQ(parPeekErrorGlb(), kParOk);

  const ParBlock* run1 = parTargetByNameNum(file_, "RUN", 1);
  const ParBlock* run2 = parTargetByNameNum(file_, "RUN", 2);
  ASSERT_NE(run1, nullptr);
  ASSERT_NE(run2, nullptr);
  EXPECT_NE(run1, run2);
  EXPECT_NE(parTargetByNameNum(file_, "OTHER", 1), nullptr);
  EXPECT_EQ(parTargetByNameNum(file_, "RUN", 3), nullptr);
  // Names are case-sensitive; sections are not targets.
  EXPECT_EQ(parTargetByNameNum(file_, "run", 1), nullptr);
  EXPECT_EQ(parTargetByNameNum(file_, "A", 1), nullptr);

  const ParBlock* a1 = parSectionByNameNum(run1, "A", 1);
  const ParBlock* a2 = parSectionByNameNum(run1, "A", 2);
  ASSERT_NE(a1, nullptr);
  ASSERT_NE(a2, nullptr);
  EXPECT_EQ(parSectionByNameNum(run2, "A", 1), nullptr);
  // Only sections directly inside the block are found.
  EXPECT_EQ(parSectionByNameNum(run1, "INNER", 1), nullptr);
  const ParBlock* inner = parSectionByNameNum(a1, "INNER", 1);
  ASSERT_NE(inner, nullptr);
  const char* text = nullptr;
  ASSERT_TRUE(parGetListParam(inner, "Deep", 1, "s", &text));
  EXPECT_STREQ(text, "x");

  std::int32_t value = 0;
  ASSERT_TRUE(parGetParam(a1, "Key", &value, 1, 1));
  EXPECT_EQ(value, 1);
  ASSERT_TRUE(parGetParam(a1, "Key", &value, 2, 2));
  EXPECT_EQ(value, 3);
  ASSERT_TRUE(parGetParam(a2, "Key", &value, 1, 1));
  EXPECT_EQ(value, 4);
  EXPECT_FALSE(parGetParam(a1, "Key", &value, 3, 1));
  EXPECT_EQ(parPeekErrorGlb(), kParErrorMissing);
  EXPECT_EQ(value, 4);

  const ParKeyword* key2 = parKeywordByNameNum(a1, "Key", 2);
  EXPECT_EQ(parKeywordLine(key2), 5);
  EXPECT_STREQ(parFileName(file_), "case.pfs");
  ASSERT_NE(parParamByNum(key2, 2), nullptr);
  EXPECT_EQ(parParamByNum(key2, 3), nullptr);
  EXPECT_EQ(parParamByNum(key2, 0), nullptr);
}

TEST_F(ParFileTest, LineEndsBomBlanksAndComments) {
  ASSERT_NE(load("\xEF\xBB\xBF[T]\r\n"
                 "\t[S]\r\n"
                 "\t\tA=1,2//no blanks needed\r\n"
                 "\t\tB   =   'it // is text'   ,   |dir//f.txt|  // comment\r\n"
                 "\r\n"
                 "   \t  \r\n"
                 "\t\tC = word_1\r\n"
                 "\tEndSect// S\r\n"
                 "EndSect"),  // no line end at the end of the file
            nullptr)
      << parErrorTextGlb();
  const ParBlock* s = section("T", "S");
  ASSERT_NE(s, nullptr);
  std::int32_t a = 0, b = 0;
  ASSERT_TRUE(parGetListParam(s, "A", 1, "ii", &a, &b));
  EXPECT_EQ(a, 1);
  EXPECT_EQ(b, 2);
  EXPECT_STREQ(textOf(s, "B", 1), "it // is text");
  const char* name = nullptr;
  ASSERT_TRUE(parGetParamFilename(s, "B", &name, 1, 2));
  EXPECT_EQ(std::string(name), dir_.path() + "/dir//f.txt");
  EXPECT_STREQ(textOf(s, "C", 1), "word_1");
}

// Each malformed line is reported with its line number and a reason.
TEST_F(ParFileTest, SyntaxErrorsNameLineAndReason) {
  struct Case {
    std::string text;
    std::string error;
  };
  const Case cases[] = {
      {"[T]\n  [S]\n  EndSect\n", "case.pfs:1: block T is not closed (EndSect missing)"},
      {"[T]\n  [S]\nEndSect\n", "case.pfs:1: block T is not closed (EndSect missing)"},
      {"[T]\n  [S]\n", "case.pfs:2: block S is not closed (EndSect missing)"},
      {"[T]\nEndSect\nEndSect\n", "case.pfs:3: EndSect without an open block"},
      {"[T]\n  A = 1\n  garbage\nEndSect\n",
       "case.pfs:3: expected '=' after keyword 'garbage', found the line end"},
      {"[T]\n  * = 1\nEndSect\n",
       "case.pfs:2: expected '[NAME]', 'EndSect' or 'NAME = value', found '* = 1'"},
      {"[T]\n  A = 'open\nEndSect\n",
       "case.pfs:2: unterminated text (closing ' missing) in keyword A"},
      {"[T]\n  A = |open.txt\nEndSect\n",
       "case.pfs:2: unterminated file name (closing | missing) in keyword A"},
      {"[T]\n\n  A = 1.5.2\nEndSect\n", "case.pfs:3: invalid number '1.5.2' in keyword A"},
      {"[T]\n  A = 12abc\nEndSect\n", "case.pfs:2: invalid number '12abc' in keyword A"},
      {"[T]\n  A = 1e\nEndSect\n", "case.pfs:2: invalid number '1e' in keyword A"},
      {"[T]\n  A = -\nEndSect\n", "case.pfs:2: invalid number '-' in keyword A"},
      {"A = 1\n", "case.pfs:1: keyword A outside of any block"},
      {"[T]\n  A =\nEndSect\n", "case.pfs:2: keyword A has no value"},
      {"[T]\n  A = 1,\nEndSect\n", "case.pfs:2: missing value after ',' in keyword A"},
      {"[T]\n  A = 1 2\nEndSect\n",
       "case.pfs:2: expected ',' between the values of keyword A, found '2'"},
      {"[T]\n  A = 'x' y\nEndSect\n",
       "case.pfs:2: expected ',' between the values of keyword A, found 'y'"},
      {"[T]\n  A = 12 pts filter\nEndSect\n",
       "case.pfs:2: expected ',' between the values of keyword A, found 'pts filter'"},
      {"[T] x\nEndSect\n", "case.pfs:1: unexpected text after [T]: 'x'"},
      {"[T\nEndSect\n", "case.pfs:1: expected ']' after block name 'T', found the line end"},
      {"[]\nEndSect\n", "case.pfs:1: missing or invalid block name in ']'"},
      {"[T]\nEndSect x\n", "case.pfs:2: unexpected text after EndSect: 'x'"},
      {"[T]\n  A = \"quoted\"\nEndSect\n",
       "case.pfs:2: invalid value '\"quoted\"' in keyword A"},
      {std::string("[T]\n  A = 1\0\nEndSect\n", 21), "case.pfs:2: NUL byte in the line"},
      {"[T]\n  A = \x01\x7f\nEndSect\n", "case.pfs:2: invalid value '\\x01\\x7F' in keyword A"},
  };
  for (const Case& c : cases) {
    SCOPED_TRACE(c.text);
    EXPECT_EQ(syntaxError(c.text), c.error);
  }
}

TEST_F(ParFileTest, EmptyAndCommentOnlyFilesHaveNoTargets) {
  for (const char* text : {"", "// nothing\n\n   // at all\n"}) {
    ASSERT_NE(load(text), nullptr) << parErrorTextGlb();
    EXPECT_EQ(parTargetByNameNum(file_, "T", 1), nullptr);
    EXPECT_EQ(parPeekErrorGlb(), kParErrorMissing);
  }
}

TEST_F(ParFileTest, LoadFailures) {
  ParFile* file = parLoadFile(dir_.file("missing.pfs").c_str(), 1);
  EXPECT_EQ(file, nullptr);
  EXPECT_EQ(parPeekErrorGlb(), kParErrorOpen);
  EXPECT_STREQ(parErrorTextGlb(), "Can't open missing.pfs");

  file = parLoadFile(dir_.path().c_str(), 1);  // a directory
  EXPECT_EQ(file, nullptr);
  EXPECT_EQ(parPeekErrorGlb(), kParErrorOpen);

  // The name in the message is the base name, readable, on one line.
  file = parLoadFile(dir_.file("m\xC3\xA5ling\nny.pfs").c_str(), 1);
  EXPECT_EQ(file, nullptr);
  EXPECT_STREQ(parErrorTextGlb(), "Can't open m\xC3\xA5ling\\x0Any.pfs");

  file = parLoadFile(nullptr, 1);
  EXPECT_EQ(file, nullptr);
  EXPECT_NE(parPeekErrorGlb(), kParOk);

  // A file larger than the limit is refused before it is parsed (sparse, so
  // it takes no disk space).
  const std::string big = dir_.write("big.pfs", "[T]\n");
  ASSERT_EQ(truncate(big.c_str(), static_cast<off_t>(kParMaxFileSize + 1)), 0);
  file = parLoadFile(big.c_str(), 1);
  EXPECT_EQ(file, nullptr);
  EXPECT_EQ(parPeekErrorGlb(), kParErrorTooLarge);
  EXPECT_EQ(std::string(parErrorTextGlb()).rfind("Can't open big.pfs", 0), 0u);

  if (geteuid() != 0) {  // root reads every file
    const std::string locked = dir_.write("locked.pfs", "[T]\nEndSect\n");
    ASSERT_EQ(chmod(locked.c_str(), 0), 0);
    EXPECT_EQ(parLoadFile(locked.c_str(), 1), nullptr);
    EXPECT_STREQ(parErrorTextGlb(), "Can't open locked.pfs");
  }

  parClose(&file);  // closing nothing is harmless
  parClose(nullptr);
  EXPECT_EQ(file, nullptr);
}

TEST_F(ParFileTest, NumberConversions) {
  ASSERT_NE(load("[T]\n [S]\n"
                 "  I = 20, -7, +3, 2147483647, -2147483648\n"
                 "  Big = 2147483648, -2147483649, 99999999999999999999\n"
                 "  F = -1.5, 2.5e-3, .5, 7., 1E2, 3.4e38, 1e-50\n"
                 "  NotInt = 1.5, 1e3, 1.0, 'text', word, |f.txt|\n"
                 "  NotFloat = 1e39, -1e400, 'x', word, |f|\n"
                 " EndSect\nEndSect\n"),
            nullptr)
      << parErrorTextGlb();
  const ParBlock* s = section("T", "S");
  ASSERT_NE(s, nullptr);

  const std::int32_t ints[] = {20, -7, 3, 2147483647, INT32_MIN};
  for (int n = 1; n <= 5; ++n) {
    std::int32_t value = 0;
    EXPECT_TRUE(parGetParam(s, "I", &value, 1, n)) << n;
    EXPECT_EQ(value, ints[n - 1]);
    float f = 0;
    EXPECT_TRUE(parGetParam(s, "I", &f, 1, n)) << "an integer is also a float";
    EXPECT_EQ(f, static_cast<float>(ints[n - 1]));
  }
  for (int n = 1; n <= 3; ++n) {
    std::int32_t value = 11;
    EXPECT_FALSE(parGetParam(s, "Big", &value, 1, n)) << n;
    EXPECT_EQ(parPeekErrorGlb(), kParErrorConvert);
    EXPECT_EQ(value, 11) << "a failed read leaves the output alone";
  }
  const float floats[] = {-1.5f, 2.5e-3f, 0.5f, 7.0f, 100.0f, 3.4e38f, 0.0f};
  for (int n = 1; n <= 7; ++n) {
    float value = 11;
    EXPECT_TRUE(parGetParam(s, "F", &value, 1, n)) << n;
    EXPECT_EQ(value, floats[n - 1]);
  }
  for (int n = 1; n <= 6; ++n) {
    std::int32_t value = 11;
    EXPECT_FALSE(parGetParam(s, "NotInt", &value, 1, n)) << n;
    EXPECT_EQ(parPeekErrorGlb(), kParErrorConvert);
    EXPECT_EQ(value, 11);
  }
  for (int n = 1; n <= 5; ++n) {
    float value = 11;
    EXPECT_FALSE(parGetParam(s, "NotFloat", &value, 1, n)) << n;
    EXPECT_EQ(parPeekErrorGlb(), kParErrorConvert);
    EXPECT_EQ(value, 11);
  }

  std::int32_t value = 0;
  EXPECT_FALSE(parGetParam(s, "NotInt", &value, 1, 1));
  EXPECT_STREQ(parErrorTextGlb(),
               "case.pfs:6: keyword NotInt: parameter 1 (the number 1.5) is not an integer");
  EXPECT_FALSE(parGetParam(s, "Big", &value, 1, 1));
  EXPECT_STREQ(parErrorTextGlb(),
               "case.pfs:4: keyword Big: parameter 1 (the number 2147483648) is not an integer "
               "within 32 bits");
  float f = 0;
  EXPECT_FALSE(parGetParam(s, "NotFloat", &f, 1, 4));
  EXPECT_STREQ(parErrorTextGlb(),
               "case.pfs:7: keyword NotFloat: parameter 4 (the word word) is not a number");
}

TEST_F(ParFileTest, TextsAndFileNames) {
  ASSERT_NE(load("[T]\n [S]\n"
                 "  Text = 'UTM-32', '', '12 pts filter', bilinear, 5, |a.txt|\n"
                 "  Files = |obs.txt|, |./sub/bathy.nc|, |/abs/path.nc|, ||, 'quoted', |../up.nc|\n"
                 " EndSect\nEndSect\n"),
            nullptr)
      << parErrorTextGlb();
  const ParBlock* s = section("T", "S");
  ASSERT_NE(s, nullptr);
  EXPECT_STREQ(textOf(s, "Text", 1), "UTM-32");
  EXPECT_STREQ(textOf(s, "Text", 2), "");
  EXPECT_STREQ(textOf(s, "Text", 3), "12 pts filter");
  EXPECT_STREQ(textOf(s, "Text", 4), "bilinear");
  for (int n : {5, 6}) {
    EXPECT_EQ(textOf(s, "Text", n), nullptr) << n;
    EXPECT_EQ(parPeekErrorGlb(), kParErrorConvert);
  }
  // parGetString never gives null, even for a parameter of another kind.
  const ParParam* number = parParamByNum(parKeywordByNameNum(s, "Text", 1), 5);
  ASSERT_NE(number, nullptr);
  ASSERT_NE(parGetString(number), nullptr);
  EXPECT_STREQ(parGetString(number), "");
  EXPECT_STREQ(parGetString(nullptr), "");
  EXPECT_NE(parPeekErrorGlb(), kParOk);

  const std::string expected[] = {dir_.path() + "/obs.txt", dir_.path() + "/sub/bathy.nc",
                                  "/abs/path.nc", "", "", dir_.path() + "/../up.nc"};
  for (int n = 1; n <= 6; ++n) {
    const char* name = "unchanged";
    const bool ok = parGetParamFilename(s, "Files", &name, 1, n) != 0;
    if (n == 5) {
      EXPECT_FALSE(ok) << "a quoted text is not a file name";
      EXPECT_STREQ(name, "unchanged");
    } else {
      EXPECT_TRUE(ok) << n;
      EXPECT_EQ(std::string(name), expected[n - 1]);
    }
  }
}

// A relative parameter-file path gives relative file names against it.
TEST_F(ParFileTest, FileNamesRelativeToARelativeParameterFile) {
  dir_.write("rel.pfs", "[T]\n [S]\n  F = |data/x.txt|\n EndSect\nEndSect\n");
  char* previous = getcwd(nullptr, 0);
  ASSERT_EQ(chdir(dir_.path().c_str()), 0);
  ParFile* here = parLoadFile("rel.pfs", 1);
  ParFile* parent = parLoadFile(("../" + dir_.path().substr(dir_.path().rfind('/') + 1) +
                                 "/rel.pfs").c_str(), 1);
  ASSERT_EQ(chdir(previous), 0);
  free(previous);
  ASSERT_NE(here, nullptr);
  ASSERT_NE(parent, nullptr);
  const char* name = nullptr;
  const ParBlock* t = parTargetByNameNum(here, "T", 1);
  ASSERT_TRUE(parGetParamFilename(parSectionByNameNum(t, "S", 1), "F", &name, 1, 1));
  EXPECT_STREQ(name, "data/x.txt");
  t = parTargetByNameNum(parent, "T", 1);
  ASSERT_TRUE(parGetParamFilename(parSectionByNameNum(t, "S", 1), "F", &name, 1, 1));
  EXPECT_EQ(std::string(name),
            "../" + dir_.path().substr(dir_.path().rfind('/') + 1) + "/data/x.txt");
  parClose(&here);
  parClose(&parent);
}

TEST_F(ParFileTest, ListParameters) {
  ASSERT_NE(load("[T]\n [S]\n"
                 "  Two = 0, 19\n"
                 "  Floats = 10, 2.5\n"
                 "  Three = 1, 2, 3\n"
                 "  Mixed = 4, 'x'\n"
                 "  Half = 7, 1.5\n"
                 " EndSect\nEndSect\n"),
            nullptr)
      << parErrorTextGlb();
  const ParBlock* s = section("T", "S");
  ASSERT_NE(s, nullptr);
  std::int32_t a = -1, b = -1;
  ASSERT_TRUE(parGetListParam(s, "Two", 1, "ii", &a, &b));
  EXPECT_EQ(a, 0);
  EXPECT_EQ(b, 19);
  float x = -1, y = -1;
  ASSERT_TRUE(parGetListParam(s, "Floats", 1, "ff", &x, &y));
  EXPECT_EQ(x, 10.0f);
  EXPECT_EQ(y, 2.5f);
  const char* text = nullptr;
  ASSERT_TRUE(parGetListParam(s, "Mixed", 1, "is", &a, &text));
  EXPECT_EQ(a, 4);
  EXPECT_STREQ(text, "x");

  // The count must match the format exactly.
  a = b = -1;
  EXPECT_FALSE(parGetListParam(s, "Three", 1, "ii", &a, &b));
  EXPECT_STREQ(parErrorTextGlb(), "case.pfs:5: keyword Three has 3 values, 2 expected");
  std::int32_t c = -1;
  EXPECT_FALSE(parGetListParam(s, "Two", 1, "iii", &a, &b, &c));
  // Either every output is stored or none: the first value converts, the
  // second does not.
  EXPECT_FALSE(parGetListParam(s, "Half", 1, "ii", &a, &b));
  EXPECT_EQ(parPeekErrorGlb(), kParErrorConvert);
  EXPECT_EQ(a, -1);
  EXPECT_EQ(b, -1);
  // Format letters and output types must agree.
  EXPECT_FALSE(parGetListParam(s, "Two", 1, "if", &a, &b));
  EXPECT_EQ(parPeekErrorGlb(), kParErrorArgument);
  EXPECT_FALSE(parGetListParam(s, "Two", 1, "i", &a, &b));
  EXPECT_EQ(a, -1);
  EXPECT_FALSE(parGetListParam(s, "Nope", 1, "ii", &a, &b));
  EXPECT_EQ(parPeekErrorGlb(), kParErrorMissing);
}

TEST_F(ParFileTest, MissingThingsAreReportedWhereTheyBelong) {
  ASSERT_NE(load("[T]\n"
                 "  [S]\n"
                 "    K = 1\n"
                 "  EndSect\n"
                 "  [S2]\n"
                 "  EndSect\n"
                 "EndSect\n"
                 "// end\n"),
            nullptr);
  EXPECT_EQ(parTargetByNameNum(file_, "X", 1), nullptr);
  EXPECT_STREQ(parErrorTextGlb(), "case.pfs:8: target [X] not found");
  const ParBlock* t = parTargetByNameNum(file_, "T", 1);
  ASSERT_NE(t, nullptr);
  EXPECT_EQ(parSectionByNameNum(t, "S3", 1), nullptr);
  EXPECT_STREQ(parErrorTextGlb(), "case.pfs:7: section [S3] not found in [T]");
  EXPECT_EQ(parSectionByNameNum(t, "S", 2), nullptr);
  EXPECT_STREQ(parErrorTextGlb(), "case.pfs:7: occurrence 2 of section [S] not found in [T]");
  const ParBlock* s = parSectionByNameNum(t, "S", 1);
  ASSERT_NE(s, nullptr);
  float f = 0;
  EXPECT_FALSE(parGetParam(s, "Missing", &f, 1, 1));
  EXPECT_EQ(parPeekErrorGlb(), kParErrorMissing);
  EXPECT_STREQ(parErrorTextGlb(), "case.pfs:4: keyword Missing not found in section [S]");
  EXPECT_FALSE(parGetParam(s, "K", &f, 1, 2));
  EXPECT_STREQ(parErrorTextGlb(), "case.pfs:3: keyword K has no parameter 2 (it has 1)");

  // A successful call clears the pending error.
  EXPECT_TRUE(parGetParam(s, "K", &f, 1, 1));
  EXPECT_EQ(parPeekErrorGlb(), kParOk);
  EXPECT_STREQ(parErrorTextGlb(), "");

  // Bad arguments fail instead of crashing.
  EXPECT_EQ(parTargetByNameNum(nullptr, "T", 1), nullptr);
  EXPECT_EQ(parTargetByNameNum(file_, "T", 0), nullptr);
  EXPECT_EQ(parSectionByNameNum(nullptr, "S", 1), nullptr);
  EXPECT_EQ(parKeywordByNameNum(s, nullptr, 1), nullptr);
  EXPECT_EQ(parParamByNum(nullptr, 1), nullptr);
  EXPECT_FALSE(parGetParam(nullptr, "K", &f, 1, 1));
  EXPECT_EQ(parPeekErrorGlb(), kParErrorArgument);
}

}  // namespace
}  // namespace karnet
