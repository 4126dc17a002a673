#include "platform/linux/folding/waiting_values.h"

#include <algorithm>
#include <cerrno>
#include <sys/mman.h>
#include <unistd.h>

#include "base/bytes.h"
#include "base/limits.h"
#include "platform/linux/files/system_error.h"
#include "platform/linux/segments/writer_presence.h"

namespace tavrel {
namespace {

// Passes the selected values on.
class SelectingSink final : public SegmentSink {
 public:
  SelectingSink(const RowSelection& selection, SegmentSink& sink)
      : selection_(selection), sink_(sink) {}
  void takeScalar(const SegmentScalar& scalar) override {
    if (selection_.contains(scalar.day, scalar.key)) sink_.takeScalar(scalar);
  }
  void takeRecord(const SegmentRecord& record) override {
    if (selection_.contains(record.day, *record.key)) sink_.takeRecord(record);
  }

 private:
  const RowSelection& selection_;
  SegmentSink& sink_;
};

Status writeAll(int file, ByteSpan bytes) {
  while (!bytes.empty()) {
    const ssize_t put = ::write(file, bytes.data(), bytes.size());
    if (put < 0 && errno == EINTR) continue;
    if (put < 0) return systemError("copy", "segments");
    bytes = bytes.subspan(static_cast<std::size_t>(put));
  }
  return Done{};
}

Status readAll(int file, std::span<std::byte> into, std::uint64_t from) {
  while (!into.empty()) {
    const ssize_t got = pread(file, into.data(), into.size(), static_cast<off_t>(from));
    if (got < 0 && errno == EINTR) continue;
    if (got <= 0) return systemError("read", "the copy of segments", got < 0 ? errno : EIO);
    into = into.subspan(static_cast<std::size_t>(got));
    from += static_cast<std::uint64_t>(got);
  }
  return Done{};
}

}  // namespace

Expected<WaitingValues> WaitingValues::read(const SegmentFolder& folder, const Recorders& recorders,
                                            SqliteHistory* history, const RowSelection& selection) {
  WaitingValues waiting;
  if (selection.hasValues) {
    waiting.copied_ = Descriptor(memfd_create("waiting values", MFD_CLOEXEC));
    if (!waiting.copied_) return systemError("copy segments from", folder.path());
  }
  const Expected<SegmentFolder::Listing> listing = folder.list();
  if (!listing) return listing.error();
  for (const auto& [owner, count] : listing->leftOut)
    waiting.leftOut_ += count;
  SegmentNames found;
  FoldedRows rows;
  PendingDistributions buffer;
  for (const SegmentEntry& entry : listing->segments) {
    if (waiting.blocks_ >= limits::kWaitingBlocks ||
        waiting.scalars_.bytes() >= limits::kFoldKeyBytes) {
      ++waiting.leftOut_;
      continue;
    }
    const auto opening = folder.openSegment(entry);
    if (!opening) return opening.error();
    // The next fold logs the refusal.
    if (!opening->segment) continue;
    Status added =
        waiting.add(*opening->segment, recorders, history, selection, found, rows, buffer);
    if (!added) return added.error();
  }
  return waiting;
}

Status WaitingValues::add(const OpenSegment& segment, const Recorders& recorders,
                          SqliteHistory* history, const RowSelection& selection,
                          SegmentNames& found, FoldedRows& rows, PendingDistributions& buffer) {
  SegmentReader reader(segment.file.get());
  // No lease here: it could disturb a fold.
  const bool isWriterGone = findSegmentProcess(reader.facts()) == WriterPresence::Gone;
  const auto state = reader.state();
  if (Status done = reader.readable(); !done) return done;
  if (!state || *state != SegmentReader::State::Begun) return Done{};
  // Folds refuse the copies of a segment.
  if (!found.insert({segment.entry.owner, reader.facts().identity}).second) return Done{};
  SegmentPosition position;
  if (history != nullptr && history->hasStore()) {
    const auto stored = history->segmentPosition(segment.entry.owner, reader.facts().identity);
    if (!stored) return stored.error();
    if (*stored) {
      auto decoded = SegmentPosition::decode(**stored);
      if (!decoded) {
        ++leftOut_;
        return Done{};
      }
      position = *std::move(decoded);
      if (position.isEnd) return Done{};
    }
  }
  SegmentIntake intake(segment.entry.owner, recorders, rows, scalars_, buffer);
  SegmentLook look;
  SelectingSink sink(selection, recorders.areRightsKnown(segment.entry.owner)
                                    ? static_cast<SegmentSink&>(intake)
                                    : look);
  reader.read(position, currentBootInstant(), isWriterGone, sink);
  if (Status done = reader.readable(); !done) return done;
  if (look.hasValues()) ++withoutRights_;
  Status added = Done{};
  buffer.each([&](std::int32_t day, std::string_view key, const DistributionBlock& block) {
    if (added) added = addSeries(selection, day, key, block);
  });
  buffer.clear();
  return added;
}

Status WaitingValues::addSeries(const RowSelection& selection, std::int32_t day,
                                std::string_view key, const DistributionBlock& block) {
  auto found = distributions_.find(std::pair(day, key));
  if (found == distributions_.end()) {
    found = distributions_.emplace(RowName(day, key), Series()).first;
  }
  Series& series = found->second;
  const std::size_t count = block.values.size() / kPackedValueBytes;
  series.count += static_cast<std::int64_t>(count);
  if (!selection.hasValues) return Done{};
  std::vector<DistributionSample> samples(count);
  for (std::size_t i = 0; i < count; ++i) {
    samples[i] = {packedValueAt(block.values.data() + i * kPackedValueBytes),
                  packedOffsetAt(block.offsets.data() + i * kPackedOffsetBytes)};
  }
  const auto bytes = std::as_bytes(std::span(samples));
  if (Status done = writeAll(copied_.get(), bytes); !done) return done;
  series.blocks.push_back({copies_, count});
  copies_ += count;
  ++blocks_;
  return Done{};
}

Expected<std::size_t> WaitingValues::readSeries(const Series& series, Series::Place& place,
                                                std::span<DistributionSample> into) const {
  std::size_t count = 0;
  while (count < into.size() && place.block < series.blocks.size()) {
    const Series::Block& block = series.blocks[place.block];
    const auto most = std::min<std::uint64_t>(block.count - place.offset, into.size() - count);
    const auto part = into.subspan(count, static_cast<std::size_t>(most));
    const std::uint64_t from = (block.first + place.offset) * sizeof(DistributionSample);
    if (Status done = readAll(copied_.get(), std::as_writable_bytes(part), from); !done) {
      return done.error();
    }
    count += part.size();
    place.offset += part.size();
    if (place.offset == block.count) place = {place.block + 1, 0};
  }
  return count;
}

}  // namespace tavrel
