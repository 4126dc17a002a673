#include "platform/linux/segments/segment_reader.h"

#include <algorithm>
#include <bit>
#include <cerrno>
#include <ctime>
#include <limits>
#include <sys/stat.h>
#include <unistd.h>

#include "base/arithmetic.h"
#include "base/civil_time.h"
#include "base/system_text.h"
#include "client/segment_format.h"

namespace tavrel {
namespace {

// How often to look at a cell that is being set before leaving it for the next fold.
constexpr int kCellAttempts = 8;

// Chunks per system call.
constexpr std::uint32_t kChunksAtOnce = 16;

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
  const std::int64_t day = dayOfSecond(seconds);
  if (day != static_cast<std::int32_t>(day)) return std::nullopt;
  return Instant{static_cast<std::int32_t>(day), secondOfDay(seconds)};
}

// The same for many instants of mostly the same day, without divisions.
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

// A segment's time as UTC seconds. For a time without a date, `boot` must be known.
std::int64_t secondsOf(std::uint64_t time, BootInstant boot) {
  const auto seconds = static_cast<std::int64_t>(time & ~kBHUndated);
  return isUndated(time) ? saturatingAdd(seconds, *boot) : seconds;
}

// The time of a set as UTC nanoseconds, saturated.
std::int64_t nanosecondsOf(std::uint64_t time, BootInstant boot) {
  const auto nanoseconds = static_cast<std::int64_t>(time & ~kBHUndated);
  std::int64_t atBoot = 0;
  if (isUndated(time) &&
      (!boot || __builtin_mul_overflow(*boot, std::int64_t{1'000'000'000}, &atBoot))) {
    return std::numeric_limits<std::int64_t>::max();
  }
  return saturatingAdd(nanoseconds, atBoot);
}

// The content of a cell at one look.
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
  look.start = loadNative64(bytes, at + kBHCellStart).value_or(0);
  look.sets = loadNative64(bytes, at + kBHCellSets).value_or(0);
  const std::uint64_t slot = 8 * (look.sets % 2);
  look.value = static_cast<std::int64_t>(loadNative64(bytes, at + kBHCellSlots + slot).value_or(0));
  look.setTime = loadNative64(bytes, at + kBHCellTimes + slot).value_or(0);
  look.key = loadNative32(bytes, at + kBHCellKey).value_or(0);
  look.closes = loadNative32(bytes, at + kBHCellCloses).value_or(0);
  look.acknowledged = loadNative32(bytes, at + kBHCellAcknowledged).value_or(0);
  return look;
}

std::uint64_t markIn(ByteSpan chunk, std::uint32_t record) {
  return *loadNative64(chunk, kBHChunkFirst + std::uint64_t{record} * kBHRecordBytes + 8);
}

bool awaitsAcknowledgement(const CellLook& look) {
  return look.closes % 2 != 0 && look.acknowledged != look.closes;
}

// A position does not store parts that the header claims but that are not in use.
template <class Part>
void dropUnused(std::vector<Part>& parts) {
  while (!parts.empty() && parts.back() == Part{})
    parts.pop_back();
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
  std::vector<std::byte> bytes;  // of chunks
};

// The state of a chunk, and which of its records to take.
struct SegmentReader::ChunkLook {
  std::uint32_t generation = 0;  // 0: nothing to read
  std::uint32_t acknowledged = 0;
  std::uint32_t folded = 0;
  std::uint32_t ready = 0;
  bool hasNews = false;
};

SegmentReader::ChunkLook SegmentReader::chunkIn(ByteSpan bytes,
                                                const SegmentPosition::Chunk& position,
                                                bool writerIsGone) {
  ChunkLook look;
  const std::uint32_t generation = *loadNative32(bytes, kBHChunkGeneration);
  if (generation == 0 || generation % 2 != 0) return look;
  look.generation = generation;
  look.acknowledged = *loadNative32(bytes, kBHChunkAcknowledged);
  if (position.generation == generation) {
    look.folded = std::min<std::uint32_t>(position.folded, kBHChunkRecords);
  }
  look.ready = look.folded;
  // When the writer is gone, records may follow one that it never finished.
  look.hasNews = look.folded < kBHChunkRecords && (writerIsGone || markIn(bytes, look.folded) != 0);
  return look;
}

Status SegmentReader::readable() const {
  if (file_.error() == 0) return Done{};
  return Error{"cannot read a segment: " + systemText(file_.error())};
}

Expected<SegmentReader::State> SegmentReader::state() const {
  struct stat status {};
  if (fstat(descriptor_, &status) != 0) return Error{systemText(errno)};
  if (!S_ISREG(status.st_mode)) return Error{"not a regular file"};
  const std::uint64_t magic = file_.word64(kBHHeaderMagic);
  // Checked again after the magic, before which the process sets the file's size.
  if (fstat(descriptor_, &status) != 0) return Error{systemText(errno)};
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

std::uint32_t SegmentReader::cellsUsed() const {
  return std::min<std::uint32_t>(file_.word32(kBHHeaderCellsUsed), kBHCellCount);
}

std::uint32_t SegmentReader::chunksUsed() const {
  return std::min<std::uint32_t>(file_.word32(kBHHeaderChunksUsed), kBHChunkCount);
}

std::size_t SegmentReader::positionBytes() const {
  return SegmentPosition::bytesOf(cellsUsed(), chunksUsed());
}

SegmentProgress SegmentReader::read(SegmentPosition& position, BootInstant boot, bool writerIsGone,
                                    SegmentSink& sink) {
  Reading reading{position, boot, writerIsGone, sink, {}, {}};
  const std::uint64_t dropped = file_.word64(kBHHeaderDropped) - position.dropped;
  if (boot) {
    reading.progress.dropped = dropped;
    position.dropped += dropped;
  } else if (dropped > 0) {
    reading.progress.isComplete = false;  // there is no day under which to count them yet
  }
  reading.progress.nextFolds = file_.word64(kBHHeaderFolds) + 1;
  readCells(reading);
  const std::uint32_t chunks = chunksUsed();
  if (position.chunks.size() < chunks) position.chunks.resize(chunks);
  for (std::uint32_t first = 0; first < chunks; first += kChunksAtOnce)
    readChunks(reading, first, std::min(kChunksAtOnce, chunks - first));
  dropUnused(position.cells);
  dropUnused(position.chunks);
  position.isKnown = true;
  return std::move(reading.progress);
}

void SegmentReader::readCells(Reading& reading) {
  const std::uint32_t cells = cellsUsed();
  if (reading.position.cells.size() < cells) reading.position.cells.resize(cells);
  // Read many at once, to find those with news.
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

// Three looks: at the state, at the value, and at the state again, which must be unchanged.
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

  // An earlier fold took the cell's value, but its store, with the position, is lost. The cell may
  // have moved to another day since, and nobody knows how much of the value belongs to that.
  if (!reading.position.isKnown && now.acknowledged != 0) {
    if (now.closes != now.acknowledged) ++reading.progress.refused;
    folded = {now.sets, now.value};
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
      // No honest program makes such a cell: it is refused at each read, and its position is not
      // stored.
      ++reading.progress.refused;
      return;
    }
  }
  folded = {now.sets, now.value};
  if (awaitsAcknowledgement(before)) {
    reading.progress.acknowledgements.push_back({offset + kBHCellAcknowledged, before.closes});
  }
}

void SegmentReader::readChunks(Reading& reading, std::uint32_t first, std::uint32_t count) {
  const std::uint64_t offset = kBHChunks + std::uint64_t{first} * std::uint64_t{kBHChunkBytes};
  reading.bytes.resize(std::size_t{count} * kBHChunkBytes);
  const auto bytesOf = [&](std::uint32_t i) {
    return ByteSpan(reading.bytes).subspan(std::size_t{i} * kBHChunkBytes, kBHChunkBytes);
  };
  file_.read(offset, reading.bytes);
  std::array<ChunkLook, kChunksAtOnce> looks;
  bool hasNews = false;
  for (std::uint32_t i = 0; i < count; ++i) {
    looks[i] = chunkIn(bytesOf(i), reading.position.chunks[first + i], reading.writerIsGone);
    hasNews = hasNews || looks[i].hasNews;
  }
  // Without a writer, the first read is complete. With one, marks are read again after the
  // generation, and records are read again after their marks.
  const bool looksAgain = hasNews && !reading.writerIsGone;
  if (looksAgain) file_.read(offset, reading.bytes);
  for (std::uint32_t i = 0; i < count; ++i) {
    if (looks[i].hasNews) findRecords(reading, bytesOf(i), looks[i]);
  }
  if (looksAgain) file_.read(offset, reading.bytes);
  for (std::uint32_t i = 0; i < count; ++i)
    takeChunk(reading, bytesOf(i), first + i, looks[i]);
}

// Counts the consecutive records that are complete and have, or can be given, a date.
void SegmentReader::findRecords(Reading& reading, ByteSpan bytes, ChunkLook& look) {
  for (look.ready = look.folded; look.ready < kBHChunkRecords; ++look.ready) {
    const std::uint64_t mark = markIn(bytes, look.ready);
    if (mark == 0 && !reading.writerIsGone) break;
    if (!isUndated(mark) || reading.boot) continue;
    reading.progress.isComplete = false;
    break;
  }
}

void SegmentReader::takeChunk(Reading& reading, ByteSpan bytes, std::uint32_t index,
                              const ChunkLook& look) {
  if (look.generation == 0) return;
  const std::uint64_t offset = kBHChunks + std::uint64_t{index} * std::uint64_t{kBHChunkBytes};
  if (look.hasNews && !reading.writerIsGone &&
      file_.word32(offset + kBHChunkGeneration) != look.generation) {
    reading.progress.isComplete = false;
    return;
  }
  DayFinder days;
  for (std::uint32_t record = look.folded; record < look.ready; ++record) {
    const std::uint64_t mark = markIn(bytes, record);
    // Only a hostile writer removes a mark or its date.
    if (mark == 0 || (isUndated(mark) && !reading.boot)) continue;
    const std::uint64_t time = (mark & ~kBHUndated) >> 16 | (mark & kBHUndated);
    const auto number = static_cast<std::uint32_t>(mark & 0xffff);
    const std::string* const key = file_.key(number, kBHKindDistribution);
    if (key == nullptr || !days.find(secondsOf(time, reading.boot))) {
      ++reading.progress.refused;
      continue;
    }
    const std::uint64_t bits =
        *loadNative64(bytes, kBHChunkFirst + std::uint64_t{record} * kBHRecordBytes);
    reading.sink.takeRecord(
        {key, number, days.day(), days.secondInDay(), std::bit_cast<double>(bits)});
  }
  reading.position.chunks[index] = look.ready == 0
                                       ? SegmentPosition::Chunk{}
                                       : SegmentPosition::Chunk{look.generation, look.ready};
  if (look.ready == kBHChunkRecords && !reading.writerIsGone &&
      look.acknowledged != look.generation) {
    reading.progress.acknowledgements.push_back({offset + kBHChunkAcknowledged, look.generation});
  }
}

Status acknowledge(int descriptor, const SegmentProgress& progress) {
  const auto write = [&](std::uint64_t offset, const void* word, std::size_t size) {
    return pwrite(descriptor, word, size, static_cast<off_t>(offset)) == static_cast<ssize_t>(size);
  };
  for (const SegmentProgress::Acknowledgement& done : progress.acknowledgements) {
    if (!write(done.offset, &done.word, sizeof done.word)) {
      return Error{systemText(errno)};
    }
  }
  if (!write(kBHHeaderFolds, &progress.nextFolds, sizeof progress.nextFolds)) {
    return Error{systemText(errno)};
  }
  return Done{};
}

}  // namespace tavrel
