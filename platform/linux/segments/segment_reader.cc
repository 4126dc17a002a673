#include "platform/linux/segments/segment_reader.h"

#include <algorithm>
#include <bit>
#include <cerrno>
#include <ctime>
#include <limits>
#include <sys/stat.h>
#include <system_error>
#include <unistd.h>

#include "base/arithmetic.h"
#include "base/civil_time.h"
#include "client/segment_format.h"

namespace tavrel {
namespace {

// How often to look at a cell that is being set, before it is left for later.
constexpr int kCellAttempts = 8;

std::int64_t saturatingAdd(std::int64_t a, std::int64_t b) {
  std::int64_t sum;
  if (!__builtin_add_overflow(a, b, &sum)) return sum;
  return b < 0 ? std::numeric_limits<std::int64_t>::min()
               : std::numeric_limits<std::int64_t>::max();
}

std::int64_t clockSeconds(clockid_t clock) {
  timespec now{};
  clock_gettime(clock, &now);
  return now.tv_sec;
}

struct Instant {
  std::int32_t day;
  std::uint32_t secondsInDay;
};

std::optional<Instant> dayAndSecond(std::int64_t seconds) {
  std::int64_t day = seconds / kSecondsPerDay;
  std::int64_t rest = seconds % kSecondsPerDay;
  if (rest < 0) {
    rest += kSecondsPerDay;
    --day;
  }
  if (day != static_cast<std::int32_t>(day)) return std::nullopt;
  return Instant{static_cast<std::int32_t>(day), static_cast<std::uint32_t>(rest)};
}

// The same for many instants, most of which are of the same day: without divisions.
class DayFinder {
 public:
  bool find(std::int64_t seconds) {
    second_ = static_cast<std::uint64_t>(seconds) - static_cast<std::uint64_t>(midnight_);
    if (second_ < static_cast<std::uint64_t>(kSecondsPerDay)) return true;
    const auto instant = dayAndSecond(seconds);
    if (!instant) return false;
    day_ = instant->day;
    second_ = instant->secondsInDay;
    midnight_ = seconds - instant->secondsInDay;
    return true;
  }
  std::int32_t day() const { return day_; }
  std::uint32_t secondInDay() const { return static_cast<std::uint32_t>(second_); }

 private:
  std::int32_t day_ = 0;
  std::uint64_t second_ = 0;
  std::int64_t midnight_ = 0;
};

bool isUndated(std::uint64_t time) {
  return (time & kBHUndated) != 0;
}

// UTC seconds of a time in a segment. The boot's instant must be known for one without a date.
std::int64_t secondsOf(std::uint64_t time, BootInstant boot) {
  const auto seconds = static_cast<std::int64_t>(time & ~kBHUndated);
  return isUndated(time) ? saturatingAdd(seconds, *boot) : seconds;
}

// The same in nanoseconds, of the time of a set.
std::int64_t nanosecondsOf(std::uint64_t time, BootInstant boot) {
  const auto nanoseconds = static_cast<std::int64_t>(time & ~kBHUndated);
  std::int64_t atBoot = 0;
  if (isUndated(time) &&
      (!boot || __builtin_mul_overflow(*boot, std::int64_t{1'000'000'000}, &atBoot))) {
    return std::numeric_limits<std::int64_t>::max();
  }
  return saturatingAdd(nanoseconds, atBoot);
}

// One look at a cell.
struct CellLook {
  std::uint64_t start = 0;
  std::uint64_t sets = 0;
  std::int64_t value = 0;
  std::uint64_t setTime = 0;
  std::uint32_t key = 0;
  std::uint32_t closes = 0;
  std::uint32_t acknowledged = 0;
};

CellLook cellIn(ByteSpan bytes, std::uint64_t at) {
  CellLook look;
  look.start = loadLittle64(bytes, at + kBHCellStart).value_or(0);
  look.sets = loadLittle64(bytes, at + kBHCellSets).value_or(0);
  const std::uint64_t slot = 8 * (look.sets % 2);
  look.value = static_cast<std::int64_t>(loadLittle64(bytes, at + kBHCellSlots + slot).value_or(0));
  look.setTime = loadLittle64(bytes, at + kBHCellTimes + slot).value_or(0);
  look.key = loadLittle32(bytes, at + kBHCellKey).value_or(0);
  look.closes = loadLittle32(bytes, at + kBHCellCloses).value_or(0);
  look.acknowledged = loadLittle32(bytes, at + kBHCellAcknowledged).value_or(0);
  return look;
}

bool awaitsAcknowledgement(const CellLook& look) {
  return look.closes % 2 != 0 && look.acknowledged != look.closes;
}

}  // namespace

BootInstant currentBootInstant() {
  const std::int64_t now = clockSeconds(CLOCK_REALTIME);
  if (now < std::int64_t{TAVREL_BUILD_DAY} * kSecondsPerDay) return std::nullopt;
  return now - clockSeconds(CLOCK_BOOTTIME);
}

struct SegmentReader::Reading {
  SegmentPosition& position;
  BootInstant boot;
  bool writerIsGone;
  SegmentSink& sink;
  SegmentProgress progress;
};

Expected<SegmentReader::State> SegmentReader::state() const {
  struct stat status {};
  if (fstat(descriptor_, &status) != 0) return Error{std::generic_category().message(errno)};
  if (!S_ISREG(status.st_mode)) return Error{"not a regular file"};
  const std::uint64_t magic = file_.word64(kBHHeaderMagic);
  // Asked after the magic: its process gives the file the size before.
  if (fstat(descriptor_, &status) != 0) return Error{std::generic_category().message(errno)};
  if (magic == 0 && (status.st_size == 0 || status.st_size == kBHSegmentBytes)) return State::Empty;
  if (magic != kBHSegmentMagic) return Error{"not a segment"};
  if (const std::uint32_t version = file_.word32(kBHHeaderVersion); version != kBHSegmentVersion) {
    return Error{"a segment of version " + std::to_string(version) + ", not " +
                 std::to_string(kBHSegmentVersion)};
  }
  if (status.st_size != kBHSegmentBytes || file_.word64(kBHHeaderBytes) != kBHSegmentBytes) {
    return Error{"a segment of a wrong size"};
  }
  return State::Begun;
}

SegmentProgress SegmentReader::read(SegmentPosition& position, BootInstant boot, bool writerIsGone,
                                    SegmentSink& sink) {
  Reading reading{position, boot, writerIsGone, sink, {}};
  const std::uint64_t dropped = file_.word64(kBHHeaderDropped);
  reading.progress.dropped = dropped - position.dropped;
  reading.progress.nextFolds = file_.word64(kBHHeaderFolds) + 1;
  position.dropped = dropped;
  readCells(reading);
  const std::uint32_t chunks =
      std::min<std::uint32_t>(file_.word32(kBHHeaderChunksUsed), kBHChunkCount);
  if (position.chunks.size() < chunks) position.chunks.resize(chunks);
  for (std::uint32_t i = 0; i < chunks; ++i)
    readChunk(reading, i);
  return std::move(reading.progress);
}

void SegmentReader::readCells(Reading& reading) {
  const std::uint32_t cells =
      std::min<std::uint32_t>(file_.word32(kBHHeaderCellsUsed), kBHCellCount);
  if (reading.position.cells.size() < cells) reading.position.cells.resize(cells);
  // Many at once, to see which hold something new.
  constexpr std::uint32_t kAtOnce = 64;
  std::array<std::byte, std::size_t{kAtOnce} * kBHCellBytes> bytes;
  for (std::uint32_t first = 0; first < cells; first += kAtOnce) {
    file_.read(kBHCells + std::uint64_t{first} * std::uint64_t{kBHCellBytes}, bytes);
    for (std::uint32_t i = first; i < std::min(first + kAtOnce, cells); ++i) {
      const CellLook look = cellIn(bytes, std::uint64_t{i - first} * std::uint64_t{kBHCellBytes});
      const SegmentPosition::Cell& folded = reading.position.cells[i];
      const bool isFolded = look.sets == folded.sets && look.value == folded.value;
      if (look.key != 0 && (!isFolded || awaitsAcknowledgement(look))) readCell(reading, i);
    }
  }
}

// Three looks: at the state, at the value, and whether the state is still the same.
void SegmentReader::readCell(Reading& reading, std::uint32_t index) {
  const std::uint64_t offset = kBHCells + std::uint64_t{index} * std::uint64_t{kBHCellBytes};
  SegmentPosition::Cell& folded = reading.position.cells[index];
  std::array<std::byte, kBHCellBytes> bytes;
  CellLook before;
  CellLook now;
  bool isSettled = false;
  for (int attempt = 0; attempt < kCellAttempts && !isSettled; ++attempt) {
    file_.read(offset, bytes);
    before = cellIn(bytes, 0);
    if (before.key == 0) return;
    file_.read(offset, bytes);
    now = cellIn(bytes, 0);
    file_.read(offset, bytes);
    const CellLook after = cellIn(bytes, 0);
    isSettled = before.sets == now.sets && before.sets == after.sets && before.start == now.start &&
                before.start == after.start;
  }
  if (!isSettled || (isUndated(before.start) && !reading.boot)) {
    reading.progress.isComplete = false;
    return;
  }

  const bool isSet = now.sets != folded.sets;
  const std::int64_t value = isSet ? now.value : wrappingSubtract(now.value, folded.value);
  if (isSet || value != 0) {
    const std::string* const key = file_.key(before.key, kBHKindScalar);
    const auto instant = dayAndSecond(secondsOf(before.start, reading.boot));
    if (key != nullptr && instant && (isUndated(before.start) || instant->secondsInDay == 0)) {
      const std::int64_t time = isSet ? nanosecondsOf(now.setTime, reading.boot) : 0;
      reading.sink.takeScalar({*key, instant->day, isSet, value, time});
    } else {
      ++reading.progress.refused;
    }
  }
  folded = {now.sets, now.value};
  if (awaitsAcknowledgement(before)) {
    reading.progress.acknowledgements.push_back({offset + kBHCellAcknowledged, before.closes});
  }
}

void SegmentReader::readChunk(Reading& reading, std::uint32_t index) {
  const std::uint64_t offset = kBHChunks + std::uint64_t{index} * std::uint64_t{kBHChunkBytes};
  SegmentPosition::Chunk& folded = reading.position.chunks[index];
  const std::uint32_t generation = file_.word32(offset + kBHChunkGeneration);
  if (generation == 0 || generation % 2 != 0) return;
  const SegmentPosition::Chunk from =
      folded.generation == generation ? folded : SegmentPosition::Chunk{generation, 0};
  std::uint32_t end = std::min<std::uint32_t>(from.folded, kBHChunkRecords);
  if (end < kBHChunkRecords) {
    // First which records exist, then their content.
    const std::uint64_t first = kBHChunkFirst + std::uint64_t{end} * std::uint64_t{kBHRecordBytes};
    std::array<std::byte, kBHChunkBytes> bytes;
    const MutableByteSpan rest = MutableByteSpan(bytes).subspan(first);
    const auto markAt = [&](std::uint32_t record) {
      return *loadLittle64(bytes, kBHChunkFirst + std::uint64_t{record} * kBHRecordBytes + 8);
    };
    file_.read(offset + first, rest);
    std::uint32_t ready = end;
    bool isDateMissing = false;
    for (; ready < kBHChunkRecords; ++ready) {
      const std::uint64_t mark = markAt(ready);
      if (mark == 0 && !reading.writerIsGone) break;
      isDateMissing = isUndated(mark) && !reading.boot;
      if (isDateMissing) break;
    }
    if (isDateMissing) reading.progress.isComplete = false;
    // Without a writer what was read is whole.
    if (!reading.writerIsGone) {
      if (ready > end) file_.read(offset + first, rest);
      if (file_.word32(offset + kBHChunkGeneration) != generation) {
        reading.progress.isComplete = false;
        return;
      }
    }
    DayFinder days;
    for (; end < ready; ++end) {
      const std::uint64_t mark = markAt(end);
      // Only a hostile writer withdraws a mark, or its date.
      if (mark == 0 || (isUndated(mark) && !reading.boot)) continue;
      const std::uint64_t time = (mark & ~kBHUndated) >> 16 | (mark & kBHUndated);
      const auto number = static_cast<std::uint32_t>(mark & 0xffff);
      const std::string* const key = file_.key(number, kBHKindDistribution);
      if (key == nullptr || !days.find(secondsOf(time, reading.boot))) {
        ++reading.progress.refused;
        continue;
      }
      const std::uint64_t bits =
          *loadLittle64(bytes, kBHChunkFirst + std::uint64_t{end} * kBHRecordBytes);
      reading.sink.takeRecord(
          {*key, number, days.day(), days.secondInDay(), std::bit_cast<double>(bits)});
    }
  }
  folded = {generation, end};
  if (end == kBHChunkRecords && !reading.writerIsGone &&
      file_.word32(offset + kBHChunkAcknowledged) != generation) {
    reading.progress.acknowledgements.push_back({offset + kBHChunkAcknowledged, generation});
  }
}

Status acknowledge(int descriptor, const SegmentProgress& progress) {
  const auto write = [&](std::uint64_t offset, const void* word, std::size_t size) {
    return pwrite(descriptor, word, size, static_cast<off_t>(offset)) == static_cast<ssize_t>(size);
  };
  for (const SegmentProgress::Acknowledgement& done : progress.acknowledgements) {
    if (!write(done.offset, &done.word, sizeof done.word)) {
      return Error{std::generic_category().message(errno)};
    }
  }
  if (!write(kBHHeaderFolds, &progress.nextFolds, sizeof progress.nextFolds)) {
    return Error{std::generic_category().message(errno)};
  }
  return Done{};
}

}  // namespace tavrel
