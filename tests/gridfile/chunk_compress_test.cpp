// The compressed form of a result chunk: a zlib stream of the shuffled bytes
// that any inflater turns back into exactly those bytes, and never much larger
// than deflating every byte plane would make it.
#include <gtest/gtest.h>
#include <libdeflate.h>

#include <cstdint>
#include <cstring>
#include <functional>
#include <random>
#include <string>
#include <vector>

#include "gridfile/chunk_writer.h"

namespace karnet {
namespace {

std::vector<unsigned char> shuffle(const std::vector<float>& values) {
  std::vector<unsigned char> bytes(values.size() * 4);
  const auto* in = reinterpret_cast<const unsigned char*>(values.data());
  for (std::size_t b = 0; b < 4; ++b)
    for (std::size_t i = 0; i < values.size(); ++i) bytes[b * values.size() + i] = in[i * 4 + b];
  return bytes;
}

// Size of the plain zlib stream of all the shuffled bytes at the same level.
std::size_t plainSize(const std::vector<unsigned char>& bytes) {
  libdeflate_compressor* c = libdeflate_alloc_compressor(kGrdDeflateLevel);
  std::vector<unsigned char> out(libdeflate_zlib_compress_bound(c, bytes.size()));
  const std::size_t size = libdeflate_zlib_compress(c, bytes.data(), bytes.size(), out.data(),
                                                    out.size());
  libdeflate_free_compressor(c);
  return size;
}

TEST(ChunkCompression, InflatesToTheShuffledBytesAndIsNeverMuchLarger) {
  constexpr std::size_t kSide = 700;  // planes of 490 000 bytes
  std::mt19937 random(5);
  std::uniform_real_distribution<float> noise(10.0f, 20.0f);
  std::vector<float> columnValues(kSide);
  for (float& v : columnValues) v = noise(random);
  const std::vector<std::pair<std::string, std::function<float(std::size_t, std::size_t)>>>
      fields = {
          // Smooth in the exponent, noise in the low mantissa bytes.
          {"noise", [&](std::size_t, std::size_t) { return noise(random); }},
          // Every row the same: the low planes look like noise byte by byte
          // but repeat at the row length.
          {"rows repeat", [&](std::size_t, std::size_t x) { return columnValues[x]; }},
          // Land (the fill value) over most of the level, water in a corner.
          {"mostly land",
           [&](std::size_t y, std::size_t x) { return x < 200 && y < 300 ? noise(random) : -1e-30f; }},
          {"constant", [](std::size_t, std::size_t) { return 4.25f; }},
      };
  for (const auto& [name, value] : fields) {
    for (const std::size_t side : {kSide, std::size_t{40}}) {  // a small chunk as well
      std::vector<float> values(side * side);
      for (std::size_t y = 0; y < side; ++y)
        for (std::size_t x = 0; x < side; ++x) values[y * side + x] = value(y, x);
      std::vector<unsigned char> stream;
      ASSERT_TRUE(compressShuffledChunk(values.data(), values.size(), 4, stream)) << name;

      const std::vector<unsigned char> expected = shuffle(values);
      std::vector<unsigned char> back(expected.size());
      std::size_t got = 0;
      libdeflate_decompressor* d = libdeflate_alloc_decompressor();
      const libdeflate_result r = libdeflate_zlib_decompress(d, stream.data(), stream.size(),
                                                             back.data(), back.size(), &got);
      libdeflate_free_decompressor(d);
      ASSERT_EQ(r, LIBDEFLATE_SUCCESS) << name << " " << side;
      ASSERT_EQ(got, expected.size()) << name;
      EXPECT_TRUE(back == expected) << name << " " << side;
      // Planes are stored when deflate would shrink them by less than 5 %.
      EXPECT_LE(stream.size(), plainSize(expected) + plainSize(expected) / 20 + 64)
          << name << " " << side;
    }
  }
}

}  // namespace
}  // namespace karnet
