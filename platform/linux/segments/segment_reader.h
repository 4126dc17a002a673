// Reads what a process recorded into its segment (client/segment_format.h), and trusts nothing of
// it.
//
//   SegmentReader reader(descriptor);
//   Expected<SegmentReader::State> state = reader.state();
//   if (state && *state == SegmentReader::State::Begun)
//     progress = reader.read(position, dating, writerIsGone, sink);   // moves `position`
//   ... the store takes the values and `position` in one transaction ...
//   acknowledge(writableDescriptor, progress);                        // the process may go on
//   there
//
// Whatever the bytes are, a read takes bounded time and memory (some 5 MB), yields values only of
// valid keys, and leaves a position from which the next read goes on. A file that changes while it
// is read yields less now and the rest later.
#pragma once

#include <cstdint>
#include <optional>
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
  bool isSet;            // replaces the value; else is added to it
  std::int64_t value;
  /// UTC of a set, in nanoseconds since 1970: of two processes the later set counts. Saturated.
  std::int64_t setTime;
};

/// A measurement.
struct SegmentRecord {
  std::string_view key;  // valid during the call
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

/// The UTC instant of the boot in seconds since 1970, nothing while the clock is not credible: then
/// values without a date wait.
using BootInstant = std::optional<std::int64_t>;

/// The same by this machine's clocks. A clock that shows a day before that of the build is wrong.
BootInstant currentBootInstant();

/// What a read did beside yielding values.
struct SegmentProgress {
  struct Acknowledgement {
    std::uint64_t offset;
    std::uint32_t word;
  };
  std::vector<Acknowledgement> acknowledgements;
  std::uint64_t nextFolds = 0;
  std::uint64_t dropped = 0;  // values that the program lost since the position
  std::uint64_t refused = 0;  // values of invalid keys or days, skipped for good
  bool isComplete = true;     // nothing was left for later, for lack of a date or of quiet
};

class SegmentReader {
 public:
  enum class State : std::uint8_t {
    Begun,
    Empty,  // its process has not written the header yet, or died before
  };

  /// Borrows a descriptor that can be read.
  explicit SegmentReader(int descriptor) : file_(descriptor), descriptor_(descriptor) {}

  /// An error for what is no segment of this version: foreign type, size, magic.
  Expected<State> state() const;
  SegmentFacts facts() const { return file_.facts(); }

  /// Yields what came after `position`, and moves that. `writerIsGone` as it was known before the
  /// call (see `segment_writer.h`): then records after one that was never finished are read too.
  SegmentProgress read(SegmentPosition& position, BootInstant boot, bool writerIsGone,
                       SegmentSink& sink);

 private:
  struct Reading;

  void readCells(Reading& reading);
  void readCell(Reading& reading, std::uint32_t index);
  void readChunk(Reading& reading, std::uint32_t index);

  SegmentFile file_;
  int descriptor_;
};

/// Tells the process that it may use again what `progress` passed. Call it once the values and the
/// position are durable. A failure is harmless: the next fold says so again.
Status acknowledge(int writableDescriptor, const SegmentProgress& progress);

}  // namespace tavrel
