// Reads what a process recorded into its segment (client/segment_format.h), and trusts nothing of
// it.
//
//   SegmentReader reader(descriptor);
//   Expected<SegmentReader::State> state = reader.state();
//   if (state && *state == SegmentReader::State::Begun)
//     progress = reader.read(position, boot, writerIsGone, sink);   // moves `position`
//   ... the store takes the values and `position` in one transaction ...
//   acknowledge(writableDescriptor, progress);  // the process may use that space again
//
// Whatever the bytes are, a read takes bounded time and memory (some 5 MB), yields values only of
// valid keys, and leaves a position from which the next read continues. A file that changes while
// it is read yields less now and the rest later.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "platform/linux/segments/segment_file.h"
#include "platform/linux/segments/segment_position.h"

namespace tavrel {

/// A change of a scalar.
struct SegmentScalar {
  std::string_view key;  // valid during the call
  std::int32_t day;      // UTC, days since 1970-01-01
  bool isSet;            // replaces the value; otherwise it is added
  std::int64_t value;
  /// UTC of a set, in nanoseconds since 1970, saturated: when two processes set a scalar, the later
  /// set counts.
  std::int64_t setTime;
};

/// A measurement.
struct SegmentRecord {
  const std::string* key;   // valid as long as the reader
  std::uint32_t keyNumber;  // of the key in this segment, from 1 to kBHKeys
  std::int32_t day;
  std::uint32_t secondsInDay;
  double value;  // any bits, also not-a-number
};

class SegmentSink {
 public:
  virtual ~SegmentSink() = default;
  virtual void takeScalar(const SegmentScalar& scalar) = 0;
  virtual void takeRecord(const SegmentRecord& record) = 0;
};

/// The UTC instant of the boot in seconds since 1970; nothing while the clock is not credible;
/// values and losses without a date then wait.
using BootInstant = std::optional<std::int64_t>;

/// The same by this machine's clocks. Not credible: a clock that shows a day before the build.
BootInstant currentBootInstant();

/// The results of a read, apart from the values.
struct SegmentProgress {
  struct Acknowledgement {
    std::uint64_t offset;
    std::uint32_t word;
  };
  std::vector<Acknowledgement> acknowledgements;
  std::uint64_t nextFolds = 0;
  std::uint64_t dropped = 0;  // values that the program lost since the position; 0 without a date
  std::uint64_t refused = 0;  // values of invalid keys or days, skipped for good
  bool isComplete = true;     // false: values without a date, or that changed, wait
};

class SegmentReader {
 public:
  enum class State : std::uint8_t {
    Begun,
    Empty,  // its process has not written the header yet, or died first
  };

  /// Borrows a descriptor that can be read.
  explicit SegmentReader(int descriptor) : file_(descriptor), descriptor_(descriptor) {}

  /// An error for a file that is not a segment of this version: foreign type, size or magic.
  Expected<State> state() const;
  /// Complete when called after `state` has returned `Begun`.
  SegmentFacts facts() const { return file_.facts(); }

  /// Fails when some read so far has failed: the results must not be used then.
  Status readable() const;

  /// The largest size in bytes of a position after a read, by the used parts that the header
  /// claims.
  std::size_t positionBytes() const;

  /// Passes the values after `position` to `sink`, and advances it. `writerIsGone` is what
  /// `writer_presence.h` found before the call: if true, records after an unfinished one are read
  /// too.
  SegmentProgress read(SegmentPosition& position, BootInstant boot, bool writerIsGone,
                       SegmentSink& sink);

 private:
  struct Reading;
  struct ChunkLook;

  std::uint32_t cellsUsed() const;
  std::uint32_t chunksUsed() const;
  void readCells(Reading& reading);
  void readCell(Reading& reading, std::uint32_t index);
  void readChunks(Reading& reading, std::uint32_t first, std::uint32_t count);
  static ChunkLook chunkIn(ByteSpan bytes, const SegmentPosition::Chunk& position,
                           bool writerIsGone);
  static void findRecords(Reading& reading, ByteSpan bytes, ChunkLook& look);
  void takeChunk(Reading& reading, ByteSpan bytes, std::uint32_t index, const ChunkLook& look);

  SegmentFile file_;
  int descriptor_;
};

/// Lets the process reuse the space that `progress` passed. Call it once the values and the
/// position are durable. A failure is harmless: the next fold acknowledges again.
Status acknowledge(int writableDescriptor, const SegmentProgress& progress);

}  // namespace tavrel
