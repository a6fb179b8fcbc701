#ifndef KARNET_GRIDFILE_CHUNK_WRITER_H_
#define KARNET_GRIDFILE_CHUNK_WRITER_H_
// Storing the values of a new file's items chunk by chunk, compressed on
// several threads.
//
// A file is laid out by NetCDF in memory (dimensions, variables with their
// chunking, shuffle and deflate settings, attributes, coordinates); its item
// values then go straight into the chunks of that image through HDF5, each
// chunk shuffled and deflated here as the variable's filters would do it, so
// that the chunks of a batch of levels are compressed at once on as many
// threads as the writer is given. Every reader of NetCDF-4 reads the result
// as if NetCDF had written the values: the bytes of a chunk are what its
// filters undo.

#include <cstddef>
#include <cstdint>
#include <memory>
#include <string>
#include <vector>

namespace karnet {

// Deflate level of item variables. Behind the byte shuffle, analysed fields
// (noisy low mantissa bytes) shrink about as much at level 1 as at level 4
// (to 68.6 % against 68.2 % of the raw size on a 1000 x 1000 layer), at two
// thirds of the compression time.
inline constexpr int kGrdDeflateLevel = 1;

class ChunkWriter {
 public:
  // Opens the memory image of a NetCDF-4 file (size bytes, copied) for
  // writing; items names the item variables, item 1 first; timeName the
  // variable of the unlimited time dimension, empty when there is none.
  // Null when the image cannot be opened or an item variable is not laid out
  // as expected (32-bit little-endian floats in chunks one level thick, the
  // filters shuffle then deflate).
  static std::unique_ptr<ChunkWriter> open(const void* image, std::size_t size,
                                           const std::vector<std::string>& items,
                                           const std::string& timeName, float fillValue);
  ~ChunkWriter();
  ChunkWriter(const ChunkWriter&) = delete;
  ChunkWriter& operator=(const ChunkWriter&) = delete;

  // Threads that compress the chunks of one call to writeLevels (at least 1).
  void setThreads(int threads);

  // Stores levelCount consecutive z levels from firstLevel of time step `step`
  // of item `item` (from 0): data holds levelCount * ny * nx floats, x fastest.
  // An item without z takes firstLevel 0 and levelCount 1. The time step's
  // extent is made when it is first written to. false on any failure.
  bool writeLevels(std::size_t item, std::size_t step, std::int64_t firstLevel,
                   std::int64_t levelCount, const float* data);
  // Rows of the chunks of the 2-D variable `name` of doubles (laid out in
  // chunks through the filters shuffle then deflate); 0 when there is no such
  // variable.
  std::int64_t chunkRows(const std::string& name);
  // Stores rows firstRow .. firstRow+rowCount-1 of that variable: data holds
  // rowCount rows of nx doubles. The rows are whole chunks of rows (firstRow a
  // multiple of chunkRows, and rowCount too unless the rows end the
  // variable). false on any failure.
  bool writeDoubleRows(const std::string& name, std::int64_t firstRow, std::int64_t rowCount,
                       const double* data);
  // Stores the time value of step `step`.
  bool writeTime(std::size_t step, double time);
  // Closes the file and hands over its bytes: *bytes (to be released with
  // std::free) and *size. The image is not copied for it, so that a large
  // result is never in memory twice. false when the file cannot be closed;
  // the writer takes no more values either way.
  bool release(void** bytes, std::size_t* size);

 private:
  struct Impl;
  explicit ChunkWriter(std::unique_ptr<Impl> impl);
  std::unique_ptr<Impl> impl_;
};

// Shuffles the bytes of count values of elementSize bytes (all first bytes,
// then all second bytes, ...) and deflates them into out as a zlib stream at
// level 1: a chunk
// as the shuffle and deflate filters store it. Leading byte planes that
// deflate would not shrink (judged from samples) go into the stream as stored
// blocks, which every inflater reads like any other. Returns false when out
// could not be made.
bool compressShuffledChunk(const void* values, std::size_t count, std::size_t elementSize,
                           std::vector<unsigned char>& out);

}  // namespace karnet

#endif  // KARNET_GRIDFILE_CHUNK_WRITER_H_
