#include "platform/linux/store/pending_distributions.h"

#include <algorithm>
#include <tuple>

#include "base/keyed_hash.h"

namespace tavrel {
namespace {

// Estimated memory of a distribution without its values.
constexpr std::size_t kSeriesBytes = 256;

// The number of values in a distribution's first piece, and the most in a later one. Each piece has
// room for twice as many as the previous one, so that few values take little memory. Pieces stay
// small, so that distributions growing at the same time share pages.
constexpr std::uint32_t kFewest = 8;
constexpr std::uint32_t kMost = 64;

constexpr std::size_t kSampleBytes = kPackedValueBytes + kPackedOffsetBytes;

}  // namespace

std::size_t PendingDistributions::HashName::operator()(const Name& name) const {
  // The odd factor keeps the days of one key apart.
  return static_cast<std::size_t>(keyedHash(name.key)) +
         static_cast<std::size_t>(static_cast<std::uint32_t>(name.day)) * 0x9E3779B1U;
}

PendingDistributions::Series& PendingDistributions::series(std::int32_t day, std::string_view key) {
  const Name name{day, key};
  if (last_ != nullptr && last_->first == name) return last_->second;
  auto found = series_.find(name);
  if (found == series_.end()) {
    auto kept = std::make_unique<const std::string>(key);
    found = series_.try_emplace(Name{day, *kept}).first;
    found->second.key_ = std::move(kept);
    bytes_ += kSeriesBytes + key.size();
  }
  last_ = &*found;
  return found->second;
}

void PendingDistributions::grow(Series& series) {
  const std::uint32_t capacity =
      series.pieces_.empty() ? kFewest : std::min(2 * series.pieces_.back().capacity, kMost);
  series.value_ = memory_.take(capacity * kSampleBytes);
  series.offset_ = series.value_ + capacity * kPackedValueBytes;
  series.room_ = capacity;
  series.pieces_.push_back({series.value_, capacity});
  bytes_ += capacity * kSampleBytes + sizeof(Piece);
}

void PendingDistributions::append(std::int32_t day, std::string_view key,
                                  std::span<const DistributionSample> samples) {
  Series& to = series(day, key);
  for (const DistributionSample& sample : samples)
    append(to, sample.value, sample.secondsInDayOffset);
}

std::vector<const PendingDistributions::Entry*> PendingDistributions::sorted() const {
  std::vector<const Entry*> entries;
  entries.reserve(series_.size());
  for (const Entry& entry : series_)
    entries.push_back(&entry);
  std::sort(entries.begin(), entries.end(), [](const Entry* a, const Entry* b) {
    return std::tie(a->first.day, a->first.key) < std::tie(b->first.day, b->first.key);
  });
  return entries;
}

void PendingDistributions::gather(const Series& series, std::string& values, std::string& offsets) {
  values.clear();
  offsets.clear();
  for (const Piece& piece : series.pieces_) {
    const bool isLast = &piece == &series.pieces_.back();
    const std::size_t count = piece.capacity - (isLast ? series.room_ : 0);
    values += asText(ByteSpan(piece.values, count * kPackedValueBytes));
    offsets += asText(
        ByteSpan(piece.values + piece.capacity * kPackedValueBytes, count * kPackedOffsetBytes));
  }
}

void PendingDistributions::clear() {
  last_ = nullptr;
  series_.clear();
  memory_.reuse();
  bytes_ = 0;
}

}  // namespace tavrel
