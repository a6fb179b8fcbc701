#include "gridfile/chunk_writer.h"

#include <hdf5.h>
#include <libdeflate.h>

#include <algorithm>
#include <atomic>
#include <bit>
#include <cstdint>
#include <cstdlib>
#include <cstring>
#include <memory>
#include <new>
#include <string>
#include <utility>

namespace karnet {
namespace {

constexpr int kMaxRank = 4;
// The core driver's growth step of the image: one byte, so that its buffer
// always ends where the file does (the closing file writes past the end it
// had before, and nothing else tells where it ends then). Growing by a
// reallocation per extension costs little: a file grows a few hundred times.
constexpr std::size_t kImageIncrement = 1;

// A name for an in-memory image that no file can have: the core driver
// refuses to open an image under the name of an existing file, and tells
// open images apart by name.
std::string imageName() {
  static std::atomic<unsigned long> counter{0};
  return "/dev/null/karnet-image-" + std::to_string(counter.fetch_add(1));
}

struct Handle {
  hid_t id = H5I_INVALID_HID;
  herr_t (*close)(hid_t) = nullptr;
  Handle() = default;
  Handle(hid_t i, herr_t (*c)(hid_t)) : id(i), close(c) {}
  Handle(Handle&& other) noexcept : id(std::exchange(other.id, H5I_INVALID_HID)), close(other.close) {}
  Handle& operator=(Handle&& other) noexcept {
    if (this != &other) {
      release();
      id = std::exchange(other.id, H5I_INVALID_HID);
      close = other.close;
    }
    return *this;
  }
  ~Handle() { release(); }
  void release() {
    if (id >= 0 && close != nullptr) close(id);
    id = H5I_INVALID_HID;
  }
  bool ok() const { return id >= 0; }
};

}  // namespace

namespace {

// Bytes of the samples a byte plane is judged by: 16 pieces of 4 KiB spread
// evenly over it, so that runs and repeats (land, fields that repeat row by
// row) anywhere in the plane show.
constexpr std::size_t kSamplePieces = 16;
constexpr std::size_t kSamplePiece = 4096;

// Least gain, in per cent of a byte plane, for which deflating it is worth its
// time. The low bytes of measured or interpolated floats are noise that
// deflate shrinks by well under one per cent (values computed in double and
// rounded, such as error variances, by about three); deflating them takes
// two thirds of the time of a chunk.
constexpr std::size_t kWorthwhileGain = 5;

// Whether deflate gains too little on a byte plane: its samples, deflated
// together, shrink by less than kWorthwhileGain per cent.
bool incompressible(libdeflate_compressor* compressor, const unsigned char* plane,
                    std::size_t size, std::vector<unsigned char>& sample,
                    std::vector<unsigned char>& scratch) {
  if (size < kSamplePieces * kSamplePiece * 4) return false;  // small planes: just deflate
  sample.resize(kSamplePieces * kSamplePiece);
  const std::size_t step = (size - kSamplePiece) / (kSamplePieces - 1);
  for (std::size_t p = 0; p < kSamplePieces; ++p) {
    std::memcpy(sample.data() + p * kSamplePiece, plane + p * step, kSamplePiece);
  }
  scratch.resize(libdeflate_deflate_compress_bound(compressor, sample.size()));
  const std::size_t packed = libdeflate_deflate_compress(compressor, sample.data(), sample.size(),
                                                         scratch.data(), scratch.size());
  return packed == 0 || packed * 100 >= sample.size() * (100 - kWorthwhileGain);
}

// Appends data to out as stored (uncompressed) deflate blocks that are not the
// stream's last; each block holds at most 65535 bytes.
void appendStoredBlocks(const unsigned char* data, std::size_t size,
                        std::vector<unsigned char>& out) {
  constexpr std::size_t kBlock = 65535;
  for (std::size_t at = 0; at < size; at += kBlock) {
    const auto length = static_cast<std::uint16_t>(std::min(kBlock, size - at));
    const auto inverse = static_cast<std::uint16_t>(~length);
    // Block header bits: not final, type 00 (stored), then padding to the byte.
    const unsigned char header[5] = {0x00, static_cast<unsigned char>(length & 0xff),
                                     static_cast<unsigned char>(length >> 8),
                                     static_cast<unsigned char>(inverse & 0xff),
                                     static_cast<unsigned char>(inverse >> 8)};
    out.insert(out.end(), header, header + 5);
    out.insert(out.end(), data + at, data + at + length);
  }
}

}  // namespace

bool compressShuffledChunk(const void* values, std::size_t count, std::size_t elementSize,
                           std::vector<unsigned char>& out) {
  try {
    const std::size_t bytes = count * elementSize;
    std::unique_ptr<unsigned char[]> shuffled(new unsigned char[bytes]);
    const auto* in = static_cast<const unsigned char*>(values);
    for (std::size_t b = 0; b < elementSize; ++b) {
      unsigned char* to = shuffled.get() + b * count;
      for (std::size_t i = 0; i < count; ++i) to[i] = in[i * elementSize + b];
    }
    const std::unique_ptr<libdeflate_compressor, void (*)(libdeflate_compressor*)> compressor(
        libdeflate_alloc_compressor(kGrdDeflateLevel), libdeflate_free_compressor);
    if (compressor == nullptr) return false;

    // The low byte planes come first; those that deflate cannot shrink are
    // stored as they are, as stored blocks of the same deflate stream. The
    // highest plane (sign and exponent) is always deflated.
    std::size_t stored = 0;
    std::vector<unsigned char> sample, scratch;
    while (stored + 1 < elementSize &&
           incompressible(compressor.get(), shuffled.get() + stored * count, count, sample,
                          scratch)) {
      ++stored;
    }
    const std::size_t storedBytes = stored * count;
    const std::size_t rest = bytes - storedBytes;

    // zlib stream: header (deflate, 32 KiB window, fastest), the stored
    // blocks, the deflated rest (ending with the final block), and the
    // Adler-32 of all the bytes, most significant byte first.
    out.clear();
    out.reserve(2 + storedBytes + 5 * (storedBytes / 65535 + 1) +
                libdeflate_deflate_compress_bound(compressor.get(), rest) + 4);
    out.push_back(0x78);
    out.push_back(0x01);
    appendStoredBlocks(shuffled.get(), storedBytes, out);
    const std::size_t at = out.size();
    out.resize(at + libdeflate_deflate_compress_bound(compressor.get(), rest));
    const std::size_t packed = libdeflate_deflate_compress(
        compressor.get(), shuffled.get() + storedBytes, rest, out.data() + at, out.size() - at);
    if (packed == 0) return false;
    out.resize(at + packed);
    const std::uint32_t adler = libdeflate_adler32(1, shuffled.get(), bytes);
    for (int shift = 24; shift >= 0; shift -= 8) {
      out.push_back(static_cast<unsigned char>(adler >> shift));
    }
    return true;
  } catch (const std::bad_alloc&) {
    return false;
  }
}

namespace {

// The memory of the file's image, allocated as the core driver asks: when the
// file closes its buffer is kept here instead of freed.
struct ImageMemory {
  void* kept = nullptr;
  std::size_t keptSize = 0;
  bool keepOnClose = false;
  // The size of the file's buffer as last allocated: the core driver keeps it
  // at the file's end exactly (its growth step is one byte).
  std::size_t fileSize = 0;
};

void* imageMalloc(std::size_t size, H5FD_file_image_op_t operation, void* data) {
  if (operation == H5FD_FILE_IMAGE_OP_FILE_OPEN) static_cast<ImageMemory*>(data)->fileSize = size;
  return std::malloc(size);
}

void* imageMemcpy(void* to, const void* from, std::size_t size, H5FD_file_image_op_t, void*) {
  return std::memcpy(to, from, size);
}

void* imageRealloc(void* block, std::size_t size, H5FD_file_image_op_t operation, void* data) {
  void* grown = std::realloc(block, size);
  if (grown != nullptr && operation == H5FD_FILE_IMAGE_OP_FILE_RESIZE) {
    static_cast<ImageMemory*>(data)->fileSize = size;
  }
  return grown;
}

herr_t imageFree(void* block, H5FD_file_image_op_t operation, void* data) {
  auto* memory = static_cast<ImageMemory*>(data);
  if (operation == H5FD_FILE_IMAGE_OP_FILE_CLOSE && memory->keepOnClose && memory->kept == nullptr) {
    memory->kept = block;
    memory->keptSize = memory->fileSize;
  } else {
    std::free(block);
  }
  return 0;
}

// The property lists that copy the callbacks share the one record.
void* imageDataCopy(void* data) { return data; }
herr_t imageDataFree(void*) { return 0; }

// Stores the chunks of `slabs` consecutive 2-D slabs of a dataset (each ny
// rows of nx elements of elementSize bytes, x fastest, one after the other in
// data) in chunks of cy x cx: each chunk shuffled and deflated on its own, on
// up to `threads` threads, so the bytes do not depend on their number, and
// stored in order. Slab s's chunks go to the offset whose leading entries
// leading(s, offset) sets (it returns how many) and whose last two are the row
// (from firstRow) and the column. Edge chunks are stored whole, the part
// outside the data holding `fill` (one element).
template <typename Leading>
bool storeChunks(hid_t dataset, std::size_t elementSize, std::int64_t slabs, std::int64_t nx,
                 std::int64_t ny, std::int64_t cx, std::int64_t cy, std::int64_t firstRow,
                 const unsigned char* data, const unsigned char* fill, int threads,
                 Leading leading) {
  if (cx < 1 || cy < 1) return false;
  const std::int64_t across = (nx + cx - 1) / cx;
  const std::int64_t down = (ny + cy - 1) / cy;
  const std::int64_t perSlab = across * down;
  const std::int64_t tasks = perSlab * slabs;
  const auto size = static_cast<std::int64_t>(elementSize);
  std::atomic<bool> failed{false};
  // Each chunk is stored as soon as it and every chunk before it are ready
  // (in order, one thread at a time), while the other threads go on
  // compressing the next ones.
#pragma omp parallel for ordered schedule(dynamic, 1) num_threads(threads) \
    if (threads > 1 && tasks > 1)
  for (std::int64_t t = 0; t < tasks; ++t) {
    std::vector<unsigned char> compressed;
    bool made = false;
    if (!failed.load(std::memory_order_relaxed)) {
      try {
        const std::int64_t slab = t / perSlab;
        const std::int64_t row0 = (t % perSlab) / across * cy;
        const std::int64_t col0 = (t % perSlab) % across * cx;
        const std::int64_t rows = std::min(cy, ny - row0);
        const std::int64_t cols = std::min(cx, nx - col0);
        const unsigned char* slabData = data + slab * nx * ny * size;
        std::vector<unsigned char> chunk;
        const unsigned char* values = slabData + (row0 * nx + col0) * size;
        if (rows != cy || cols != cx || cx != nx) {
          chunk.resize(static_cast<std::size_t>(cx * cy * size));
          for (std::int64_t e = 0; e < cx * cy; ++e) {
            std::memcpy(chunk.data() + e * size, fill, elementSize);
          }
          for (std::int64_t r = 0; r < rows; ++r) {
            std::memcpy(chunk.data() + r * cx * size, slabData + ((row0 + r) * nx + col0) * size,
                        static_cast<std::size_t>(cols * size));
          }
          values = chunk.data();
        }
        made = compressShuffledChunk(values, static_cast<std::size_t>(cx * cy), elementSize,
                                     compressed);
      } catch (const std::bad_alloc&) {
        made = false;
      }
      if (!made) failed = true;
    }
#pragma omp ordered
    if (made && !failed.load()) {
      hsize_t offset[kMaxRank] = {};
      const int d = leading(t / perSlab, offset);
      offset[d] = static_cast<hsize_t>(firstRow + (t % perSlab) / across * cy);
      offset[d + 1] = static_cast<hsize_t>((t % perSlab) % across * cx);
      if (H5Dwrite_chunk(dataset, H5P_DEFAULT, 0, offset, compressed.size(), compressed.data()) <
          0) {
        failed = true;
      }
    }
  }
  return !failed.load();
}

// Whether the dataset is stored in chunks through the filters shuffle then
// deflate, its values of the given HDF5 type.
bool shuffledAndDeflated(hid_t dataset, hid_t type) {
  if (std::endian::native != std::endian::little) return false;
  const Handle stored(H5Dget_type(dataset), H5Tclose);
  if (!stored.ok() || H5Tequal(stored.id, type) <= 0) return false;
  const Handle plist(H5Dget_create_plist(dataset), H5Pclose);
  if (!plist.ok() || H5Pget_layout(plist.id) != H5D_CHUNKED) return false;
  if (H5Pget_nfilters(plist.id) != 2) return false;
  const H5Z_filter_t expected[2] = {H5Z_FILTER_SHUFFLE, H5Z_FILTER_DEFLATE};
  for (unsigned f = 0; f < 2; ++f) {
    unsigned flags = 0;
    std::size_t elements = 8;
    unsigned values[8] = {};
    unsigned config = 0;
    if (H5Pget_filter2(plist.id, f, &flags, &elements, values, 0, nullptr, &config) !=
        expected[f]) {
      return false;
    }
  }
  return true;
}

struct ItemDataset {
  Handle dataset;
  int rank = 0;
  bool hasTime = false;
  bool hasZ = false;
  hsize_t dims[kMaxRank] = {};
  hsize_t chunk[kMaxRank] = {};
};

// Whether the dataset's chunks can be written here: 32-bit little-endian
// floats, chunks one level thick, the filters shuffle then deflate.
bool directlyWritable(hid_t dataset, const ItemDataset& item) {
  for (int d = 0; d + 2 < item.rank; ++d) {
    if (item.chunk[d] != 1) return false;
  }
  return shuffledAndDeflated(dataset, H5T_IEEE_F32LE);
}

bool examine(hid_t dataset, bool withTime, ItemDataset& item) {
  const Handle space(H5Dget_space(dataset), H5Sclose);
  if (!space.ok()) return false;
  const int rank = H5Sget_simple_extent_ndims(space.id);
  const int spatial = rank - (withTime ? 1 : 0);
  if (rank < 2 || rank > kMaxRank || spatial < 2 || spatial > 3) return false;
  item.rank = rank;
  item.hasTime = withTime;
  item.hasZ = spatial == 3;
  if (H5Sget_simple_extent_dims(space.id, item.dims, nullptr) != rank) return false;
  const Handle plist(H5Dget_create_plist(dataset), H5Pclose);
  if (!plist.ok()) return false;
  if (H5Pget_layout(plist.id) == H5D_CHUNKED) {
    if (H5Pget_chunk(plist.id, rank, item.chunk) != rank) return false;
  }
  return directlyWritable(dataset, item);
}

// Makes the dataset's time extent reach step.
bool reachStep(hid_t dataset, hsize_t* dims, bool hasTime, std::size_t step) {
  if (!hasTime) return step == 0;
  if (dims[0] > step) return true;
  dims[0] = step + 1;
  return H5Dset_extent(dataset, dims) >= 0;
}

}  // namespace

struct ChunkWriter::Impl {
  // Declared first, so that it outlives the file that may still free into it.
  ImageMemory memory;
  Handle file;
  std::vector<ItemDataset> items;
  Handle time;
  hsize_t timeDims[1] = {0};
  float fill = 0.0f;
  int threads = 1;

  bool writeDirect(ItemDataset& item, std::size_t step, std::int64_t first, std::int64_t count,
                   const float* data);
};

ChunkWriter::ChunkWriter(std::unique_ptr<Impl> impl) : impl_(std::move(impl)) {}
ChunkWriter::~ChunkWriter() {
  if (impl_ == nullptr) return;
  // Datasets before the file.
  impl_->items.clear();
  impl_->time = Handle();
  impl_->file = Handle();
  std::free(impl_->memory.kept);
}

std::unique_ptr<ChunkWriter> ChunkWriter::open(const void* image, std::size_t size,
                                               const std::vector<std::string>& items,
                                               const std::string& timeName, float fillValue) {
  if (image == nullptr || size == 0 || items.empty()) return nullptr;
  // Failures come back as return values; HDF5 is not to print them.
  H5Eset_auto2(H5E_DEFAULT, nullptr, nullptr);
  auto impl = std::make_unique<Impl>();
  impl->fill = fillValue;
  {
    const Handle access(H5Pcreate(H5P_FILE_ACCESS), H5Pclose);
    H5FD_file_image_callbacks_t callbacks = {imageMalloc, imageMemcpy,   imageRealloc, imageFree,
                                             imageDataCopy, imageDataFree, &impl->memory};
    if (!access.ok() || H5Pset_fapl_core(access.id, kImageIncrement, 0) < 0 ||
        H5Pset_file_image_callbacks(access.id, &callbacks) < 0 ||
        H5Pset_file_image(access.id, const_cast<void*>(image), size) < 0) {
      return nullptr;
    }
    impl->file = Handle(H5Fopen(imageName().c_str(), H5F_ACC_RDWR, access.id), H5Fclose);
  }
  if (!impl->file.ok()) return nullptr;
  const bool withTime = !timeName.empty();
  if (withTime) {
    impl->time = Handle(H5Dopen2(impl->file.id, timeName.c_str(), H5P_DEFAULT), H5Dclose);
    if (!impl->time.ok()) return nullptr;
    const Handle space(H5Dget_space(impl->time.id), H5Sclose);
    if (!space.ok() || H5Sget_simple_extent_ndims(space.id) != 1 ||
        H5Sget_simple_extent_dims(space.id, impl->timeDims, nullptr) != 1) {
      return nullptr;
    }
  }
  impl->items.resize(items.size());
  for (std::size_t i = 0; i < items.size(); ++i) {
    ItemDataset& item = impl->items[i];
    item.dataset = Handle(H5Dopen2(impl->file.id, items[i].c_str(), H5P_DEFAULT), H5Dclose);
    if (!item.dataset.ok() || !examine(item.dataset.id, withTime, item)) return nullptr;
  }
  return std::unique_ptr<ChunkWriter>(new ChunkWriter(std::move(impl)));
}

void ChunkWriter::setThreads(int threads) { impl_->threads = std::max(threads, 1); }

bool ChunkWriter::writeLevels(std::size_t item, std::size_t step, std::int64_t firstLevel,
                              std::int64_t levelCount, const float* data) {
  if (item >= impl_->items.size() || data == nullptr || levelCount < 1 || firstLevel < 0) {
    return false;
  }
  ItemDataset& target = impl_->items[item];
  const std::int64_t levels =
      target.hasZ ? static_cast<std::int64_t>(target.dims[target.hasTime ? 1 : 0]) : 1;
  if (firstLevel + levelCount > levels) return false;
  if (!reachStep(target.dataset.id, target.dims, target.hasTime, step)) return false;
  return impl_->writeDirect(target, step, firstLevel, levelCount, data);
}

bool ChunkWriter::Impl::writeDirect(ItemDataset& item, std::size_t step, std::int64_t first,
                                    std::int64_t count, const float* data) {
  const auto nx = static_cast<std::int64_t>(item.dims[item.rank - 1]);
  const auto ny = static_cast<std::int64_t>(item.dims[item.rank - 2]);
  const auto cx = static_cast<std::int64_t>(item.chunk[item.rank - 1]);
  const auto cy = static_cast<std::int64_t>(item.chunk[item.rank - 2]);
  return storeChunks(item.dataset.id, sizeof(float), count, nx, ny, cx, cy, 0,
                     reinterpret_cast<const unsigned char*>(data),
                     reinterpret_cast<const unsigned char*>(&fill), threads,
                     [&item, step, first](std::int64_t level, hsize_t* offset) {
                       int d = 0;
                       if (item.hasTime) offset[d++] = step;
                       if (item.hasZ) offset[d++] = static_cast<hsize_t>(first + level);
                       return d;
                     });
}

namespace {

// A 2-D variable of doubles stored in chunks through shuffle and deflate,
// opened by name: its extent and its chunk shape (rows, columns).
struct DoubleGrid {
  Handle dataset;
  hsize_t dims[2] = {};
  hsize_t chunk[2] = {};

  bool open(hid_t file, const std::string& name) {
    dataset = Handle(H5Dopen2(file, name.c_str(), H5P_DEFAULT), H5Dclose);
    if (!dataset.ok() || !shuffledAndDeflated(dataset.id, H5T_IEEE_F64LE)) return false;
    const Handle space(H5Dget_space(dataset.id), H5Sclose);
    const Handle plist(H5Dget_create_plist(dataset.id), H5Pclose);
    return space.ok() && plist.ok() && H5Sget_simple_extent_ndims(space.id) == 2 &&
           H5Sget_simple_extent_dims(space.id, dims, nullptr) == 2 &&
           H5Pget_chunk(plist.id, 2, chunk) == 2;
  }
};

}  // namespace

std::int64_t ChunkWriter::chunkRows(const std::string& name) {
  DoubleGrid grid;
  return grid.open(impl_->file.id, name) ? static_cast<std::int64_t>(grid.chunk[0]) : 0;
}

bool ChunkWriter::writeDoubleRows(const std::string& name, std::int64_t firstRow,
                                  std::int64_t rowCount, const double* data) {
  DoubleGrid grid;
  if (data == nullptr || !grid.open(impl_->file.id, name)) return false;
  const auto ny = static_cast<std::int64_t>(grid.dims[0]);
  const auto cy = static_cast<std::int64_t>(grid.chunk[0]);
  // Whole chunks of rows, the last band ending with the data.
  if (firstRow < 0 || rowCount < 1 || cy < 1 || firstRow % cy != 0 ||
      (rowCount % cy != 0 && firstRow + rowCount != ny) || firstRow + rowCount > ny) {
    return false;
  }
  const double fillValue = 0.0;
  return storeChunks(grid.dataset.id, sizeof(double), 1, static_cast<std::int64_t>(grid.dims[1]),
                     rowCount, static_cast<std::int64_t>(grid.chunk[1]), cy, firstRow,
                     reinterpret_cast<const unsigned char*>(data),
                     reinterpret_cast<const unsigned char*>(&fillValue), impl_->threads,
                     [](std::int64_t, hsize_t*) { return 0; });
}

bool ChunkWriter::writeTime(std::size_t step, double time) {
  if (!impl_->time.ok() || !reachStep(impl_->time.id, impl_->timeDims, true, step)) return false;
  const hsize_t start[1] = {step};
  const hsize_t one[1] = {1};
  const Handle fileSpace(H5Dget_space(impl_->time.id), H5Sclose);
  const Handle memorySpace(H5Screate_simple(1, one, nullptr), H5Sclose);
  if (!fileSpace.ok() || !memorySpace.ok() ||
      H5Sselect_hyperslab(fileSpace.id, H5S_SELECT_SET, start, nullptr, one, nullptr) < 0) {
    return false;
  }
  return H5Dwrite(impl_->time.id, H5T_NATIVE_DOUBLE, memorySpace.id, fileSpace.id, H5P_DEFAULT,
                  &time) >= 0;
}

bool ChunkWriter::release(void** bytes, std::size_t* size) {
  if (!impl_->file.ok()) return false;
  impl_->items.clear();
  impl_->time = Handle();
  impl_->memory.keepOnClose = true;
  const bool closed = H5Fclose(impl_->file.id) >= 0;
  impl_->file.id = H5I_INVALID_HID;
  if (!closed || impl_->memory.kept == nullptr || impl_->memory.keptSize == 0) return false;
  *bytes = std::exchange(impl_->memory.kept, nullptr);
  *size = impl_->memory.keptSize;
  return true;
}

}  // namespace karnet
