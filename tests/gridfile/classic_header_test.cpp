// The look at classic-format headers that comes before the NetCDF library opens a file.
#include "gridfile/classic_header.h"

#include <gtest/gtest.h>
#include <unistd.h>

#include <cstdio>
#include <string>

#include "gridfile/grid_file.h"
#include "gridfile/nc_test_files.h"

namespace karnet {
namespace {

class ClassicHeaderTest : public test::ScratchTest {
 protected:
  // The header check of the bytes as a file.
  ClassicHeader check(const std::string& bytes) {
    const std::string name = file("bytes.nc");
    test::writeBytes(name, bytes);
    std::FILE* stream = std::fopen(name.c_str(), "rb");
    const ClassicHeader result = checkClassicHeader(stream, bytes.size());
    std::fclose(stream);
    return result;
  }

  std::string made(const std::string& kind, const std::string& cdl) {
    test::ncgen(file(kind + ".nc"), cdl, kind);
    return test::readBytes(file(kind + ".nc"));
  }
};

// Every attribute type of the format, names of several lengths, an unlimited dimension
// without records (the second record variable's offset then lies past the end of the file,
// as in Argo profile files with an empty history).
const char kCdl[] =
    "netcdf c {\n"
    "dimensions:\n  t = UNLIMITED ;\n  y = 3 ;\n  longer_name_x = 5 ;\n"
    "variables:\n"
    "  float v(t, y, longer_name_x) ;\n"
    "  char history(t, y, longer_name_x) ;\n"
    "    v:b = 1b, 2b, 3b ; v:s = 7s ; v:i = 1, 2 ; v:f = 1.5f ; v:d = 2.5, 3.5, 4.5 ;\n"
    "    v:text = \"abcde\" ;\n"
    "  double c ;\n"
    "  :Q84_Misc = 0.f, -1.e-30f, -900.f, 10.f, -1.e-30f, -1.e-30f, -1.e-30f ;\n"
    "  :title = \"header check\" ;\n"
    "data:\n c = 1 ;\n}\n";

TEST_F(ClassicHeaderTest, SoundFilesOfEveryClassicKindPass) {
  for (const std::string kind : {"classic", "64-bit-offset", "cdf5"}) {
    SCOPED_TRACE(kind);
    std::string cdl = kCdl;
    if (kind == "cdf5") {
      cdl.replace(cdl.find("  :title"), 0, "  :u = 1UB ; :us = 2US ; :ui = 3U ; :l = 4L ; :ul = 5UL ;\n");
    }
    const std::string bytes = made(kind, cdl);
    EXPECT_EQ(check(bytes), ClassicHeader::kSound);
    // The whole reading path opens it too.
    GrdHeader* header = nullptr;
    GrdFile* opened = nullptr;
    EXPECT_EQ(grdFileRead(file(kind + ".nc").c_str(), &header, &opened), 0);
    grdHeaderDestroy(&header);
  }
  EXPECT_EQ(check(made("nc4", kCdl)), ClassicHeader::kNotClassic);
  EXPECT_EQ(check("not NetCDF at all"), ClassicHeader::kNotClassic);
  EXPECT_EQ(check("CDF\x03rest"), ClassicHeader::kBroken);
}

TEST_F(ClassicHeaderTest, ACutHeaderIsBrokenUntilItIsWhole) {
  for (const std::string kind : {"classic", "cdf5"}) {
    SCOPED_TRACE(kind);
    const std::string bytes = made(kind, kCdl);
    bool whole = false;
    for (std::size_t length = 4; length <= bytes.size(); ++length) {
      const ClassicHeader result = check(bytes.substr(0, length));
      if (whole) {
        ASSERT_EQ(result, ClassicHeader::kSound) << "at " << length;
      } else if (result == ClassicHeader::kSound) {
        whole = true;  // the header ends here; what follows is data
        EXPECT_GT(length, 100u);
      } else {
        ASSERT_EQ(result, ClassicHeader::kBroken) << "at " << length;
      }
    }
    EXPECT_TRUE(whole);
  }
}

// A cut file whose header is whole: the values that are missing would read as zeros.
TEST_F(ClassicHeaderTest, GriddedValuesMustLieInTheFile) {
  const std::string cdl =
      "netcdf g {\ndimensions:\n  t = UNLIMITED ;\n  y = 3 ;\n  x = 4 ;\nvariables:\n"
      "  double x(x) ;\n  float depth(y, x) ;\n  short series(t, x) ;\n"
      "data:\n x = 0, 1, 2, 3 ;\n depth = 1, 2, 3, 4, 5, 6, 7, 8, 9, 10, 11, 12 ;\n"
      " series = 1, 2, 3, 4, 5, 6, 7, 8 ;\n}\n";
  for (const std::string kind : {"classic", "64-bit-offset", "cdf5"}) {
    SCOPED_TRACE(kind);
    const std::string bytes = made(kind, cdl);
    EXPECT_EQ(check(bytes), ClassicHeader::kSound);
    // The last values are those of the record variable (two records of 4 shorts).
    EXPECT_EQ(check(bytes.substr(0, bytes.size() - 8)), ClassicHeader::kBroken);
    const std::size_t depthEnd = bytes.size() - 16;  // records follow the 48 bytes of depth
    EXPECT_EQ(check(bytes.substr(0, depthEnd - 4)), ClassicHeader::kBroken);
    EXPECT_EQ(check(bytes.substr(0, depthEnd - 48)), ClassicHeader::kBroken);
  }
}

// What fuzzing found: one changed byte in an attribute's value count of a
// 613-byte file declared 6.7 GB, which the library then allocated and converted.
TEST_F(ClassicHeaderTest, DeclaredSizesBeyondTheFileAreBroken) {
  std::string bytes = made("classic", kCdl);
  ASSERT_EQ(check(bytes), ClassicHeader::kSound);
  // The global attribute Q84_Misc: its name, then type 5 (float) and 7 values.
  const std::size_t at = bytes.find("Q84_Misc");
  ASSERT_NE(at, std::string::npos);
  const std::size_t count = at + 8 + 4;
  ASSERT_EQ(bytes.substr(count, 4), std::string("\0\0\0\x07", 4));
  std::string huge = bytes;
  huge.replace(count, 4, "\x60\0\0\0");
  EXPECT_EQ(check(huge), ClassicHeader::kBroken);
  GrdHeader* header = nullptr;
  GrdFile* opened = nullptr;
  test::writeBytes(file("huge.nc"), huge);
  EXPECT_NE(grdFileRead(file("huge.nc").c_str(), &header, &opened), 0);
  // A list that claims more entries than bytes are left.
  std::string many = bytes;
  const std::size_t dims = 8;  // magic, record count, then the dimension tag and count
  ASSERT_EQ(many.substr(dims, 8), std::string("\0\0\0\x0A\0\0\0\x03", 8));
  many.replace(dims + 4, 4, "\x7f\xff\xff\xff");
  EXPECT_EQ(check(many), ClassicHeader::kBroken);
}

}  // namespace
}  // namespace karnet
