#include "gridfile/classic_header.h"

#include <cstring>
#include <vector>

namespace karnet {
namespace {

constexpr std::uint32_t kTagDimension = 0x0A;
constexpr std::uint32_t kTagVariable = 0x0B;
constexpr std::uint32_t kTagAttribute = 0x0C;

// Sequential big-endian reader over the header that never goes past the file's end.
class HeaderReader {
 public:
  HeaderReader(std::FILE* stream, std::uint64_t size, int version)
      : stream_(stream), size_(size), wide_(version == 5), offset64_(version != 1) {}

  std::uint64_t left() const { return size_ - position_; }

  bool u32(std::uint32_t* value) {
    unsigned char b[4];
    if (!bytes(b, 4)) return false;
    *value = (std::uint32_t{b[0]} << 24) | (std::uint32_t{b[1]} << 16) |
             (std::uint32_t{b[2]} << 8) | b[3];
    return true;
  }
  bool u64(std::uint64_t* value) {
    std::uint32_t high = 0, low = 0;
    if (!u32(&high) || !u32(&low)) return false;
    *value = (std::uint64_t{high} << 32) | low;
    return true;
  }
  // A count or a length: 32 bits, 64 in CDF-5.
  bool count(std::uint64_t* value) {
    if (wide_) return u64(value);
    std::uint32_t v = 0;
    if (!u32(&v)) return false;
    *value = v;
    return true;
  }
  bool offset(std::uint64_t* value) {
    if (offset64_) return u64(value);
    std::uint32_t v = 0;
    if (!u32(&v)) return false;
    *value = v;
    return true;
  }
  // Skips n bytes padded to a multiple of four, when they lie within the file.
  bool skipPadded(std::uint64_t n) {
    if (n > left()) return false;
    const std::uint64_t padded = n + (4 - n % 4) % 4;
    if (padded > left()) return false;
    if (std::fseek(stream_, static_cast<long>(padded), SEEK_CUR) != 0) return false;
    position_ += padded;
    return true;
  }
  bool name() {
    std::uint64_t length = 0;
    return count(&length) && skipPadded(length);
  }
  // The smallest number of bytes a count, a name or a dimension id takes.
  std::uint64_t countSize() const { return wide_ ? 8 : 4; }

 private:
  bool bytes(unsigned char* out, std::size_t n) {
    if (n > left() || std::fread(out, 1, n, stream_) != n) return false;
    position_ += n;
    return true;
  }

  std::FILE* stream_;
  std::uint64_t size_;
  std::uint64_t position_ = 0;
  bool wide_;
  bool offset64_;
};

std::uint64_t typeSize(std::uint32_t type, int version) {
  switch (type) {
    case 1: case 2: return 1;  // byte, char
    case 3: return 2;          // short
    case 4: case 5: return 4;  // int, float
    case 6: return 8;          // double
    default: break;
  }
  if (version != 5) return 0;
  switch (type) {
    case 7: return 1;             // unsigned byte
    case 8: return 2;             // unsigned short
    case 9: return 4;             // unsigned int
    case 10: case 11: return 8;   // 64-bit integers
    default: return 0;
  }
}

// A list header: its tag (or ABSENT, two zeros) and its element count. The
// count must leave room for each element's smallest form.
bool listHeader(HeaderReader& r, std::uint32_t tag, std::uint64_t smallest, std::uint64_t* n) {
  std::uint32_t found = 0;
  if (!r.u32(&found) || !r.count(n)) return false;
  if (found == 0) return *n == 0;
  if (found != tag) return false;
  return *n <= r.left() / smallest;
}

bool attributes(HeaderReader& r, int version) {
  std::uint64_t n = 0;
  // name length, (empty) name, type, value count
  if (!listHeader(r, kTagAttribute, 2 * r.countSize() + 4, &n)) return false;
  for (std::uint64_t i = 0; i < n; ++i) {
    std::uint32_t type = 0;
    std::uint64_t values = 0;
    if (!r.name() || !r.u32(&type) || !r.count(&values)) return false;
    const std::uint64_t size = typeSize(type, version);
    if (size == 0 || values > r.left() / size || !r.skipPadded(values * size)) return false;
  }
  return true;
}

}  // namespace

ClassicHeader checkClassicHeader(std::FILE* stream, std::uint64_t fileSize) {
  unsigned char magic[4];
  if (std::fseek(stream, 0, SEEK_SET) != 0 || std::fread(magic, 1, 4, stream) != 4 ||
      std::memcmp(magic, "CDF", 3) != 0) {
    return ClassicHeader::kNotClassic;
  }
  const int version = magic[3];
  if (version != 1 && version != 2 && version != 5) return ClassicHeader::kBroken;
  HeaderReader r(stream, fileSize - 4, version);
  std::uint64_t records = 0, n = 0;
  if (!r.count(&records)) return ClassicHeader::kBroken;
  // Dimensions: name and length (0 for the record dimension).
  if (!listHeader(r, kTagDimension, 2 * r.countSize() + 4, &n)) return ClassicHeader::kBroken;
  std::vector<std::uint64_t> lengths(static_cast<std::size_t>(n));
  for (std::uint64_t& length : lengths) {
    if (!r.name() || !r.count(&length)) return ClassicHeader::kBroken;
  }
  if (!attributes(r, version)) return ClassicHeader::kBroken;
  // Variables: name, dimension ids, attributes, type, size and offset.
  if (!listHeader(r, kTagVariable, 5 * r.countSize() + 12, &n)) return ClassicHeader::kBroken;
  const bool streaming = records == (version == 5 ? UINT64_MAX : std::uint64_t{0xFFFFFFFF});
  for (std::uint64_t i = 0; i < n; ++i) {
    std::uint64_t rank = 0;
    if (!r.name() || !r.count(&rank) || rank > r.left() / r.countSize()) {
      return ClassicHeader::kBroken;
    }
    std::vector<std::uint64_t> shape;
    bool isRecord = false;
    for (std::uint64_t d = 0; d < rank; ++d) {
      std::uint64_t id = 0;
      if (!r.count(&id) || id >= lengths.size()) return ClassicHeader::kBroken;
      if (lengths[id] == 0 && d == 0) {
        isRecord = true;
      } else {
        shape.push_back(lengths[id]);
      }
    }
    if (!attributes(r, version)) return ClassicHeader::kBroken;
    std::uint32_t type = 0;
    std::uint64_t size = 0, begin = 0;
    if (!r.u32(&type) || typeSize(type, version) == 0 || !r.count(&size) || !r.offset(&begin)) {
      return ClassicHeader::kBroken;
    }
    // The values of a gridded item (two or more dimensions) must lie in the
    // file: a cut file would otherwise read as zeros. For a record variable
    // numrecs times one record's values is a lower bound of where it ends; with
    // no records it holds nothing, and its offset (inside the first record,
    // which is not there) may lie past the end of the file.
    if (rank < 2 || (isRecord && (streaming || records == 0))) continue;
    std::uint64_t bytes = typeSize(type, version);
    for (std::uint64_t length : shape) {
      if (length != 0 && bytes > fileSize / length) return ClassicHeader::kBroken;
      bytes *= length;
    }
    if (isRecord) {
      if (records != 0 && bytes > fileSize / records) return ClassicHeader::kBroken;
      bytes *= records;
    }
    if (begin > fileSize || bytes > fileSize - begin) return ClassicHeader::kBroken;
  }
  return ClassicHeader::kSound;
}

}  // namespace karnet
