#include "platform/linux/store/pending_distributions.h"

#include <algorithm>
#include <tuple>

#include "base/keyed_hash.h"

namespace tavrel {
namespace {

// The memory of a distribution, without its values.
constexpr std::size_t kSeriesBytes = 256;

}  // namespace

std::size_t PendingDistributions::HashName::operator()(const Name& name) const {
  // An odd factor keeps the days of one key apart.
  return keyedHash(name.key) +
         static_cast<std::size_t>(static_cast<std::uint32_t>(name.day)) * 0x9E3779B1U;
}

PendingDistributions::Series& PendingDistributions::find(const Name& name) {
  if (last_ != nullptr && last_->first == name) return last_->second;
  auto found = series_.find(name);
  if (found == series_.end()) {
    auto key = std::make_unique<const std::string>(name.key);
    const Name owned{name.day, *key};
    found = series_.emplace(owned, Series{std::move(key), {}}).first;
    bytes_ += kSeriesBytes + name.key.size();
  }
  last_ = &*found;
  return found->second;
}

void PendingDistributions::append(std::int32_t day, std::string_view key,
                                  std::span<const DistributionSample> samples) {
  std::vector<Piece>& pieces = find({day, key}).pieces;
  while (!samples.empty()) {
    const std::size_t number = samples_ / Block::kSamples;
    const std::size_t first = samples_ % Block::kSamples;
    if (number == blocks_.size()) blocks_.push_back(std::make_unique_for_overwrite<Block>());
    Block& block = *blocks_[number];
    const auto taken = samples.first(std::min(samples.size(), Block::kSamples - first));
    pack(taken, MutableByteSpan(block.values).subspan(first * kPackedValueBytes),
         MutableByteSpan(block.offsets).subspan(first * kPackedOffsetBytes));
    if (!pieces.empty() && pieces.back().block == number &&
        pieces.back().first + pieces.back().count == first) {
      pieces.back().count += static_cast<std::uint32_t>(taken.size());
    } else {
      pieces.push_back(
          {number, static_cast<std::uint32_t>(first), static_cast<std::uint32_t>(taken.size())});
      bytes_ += sizeof(Piece);
    }
    samples_ += taken.size();
    bytes_ += taken.size() * kSampleBytes;
    samples = samples.subspan(taken.size());
  }
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

void PendingDistributions::gather(const Series& series, std::string& values,
                                  std::string& offsets) const {
  values.clear();
  offsets.clear();
  for (const Piece& piece : series.pieces) {
    const Block& block = *blocks_[piece.block];
    values +=
        asText(ByteSpan(block.values)
                   .subspan(piece.first * kPackedValueBytes, piece.count * kPackedValueBytes));
    offsets +=
        asText(ByteSpan(block.offsets)
                   .subspan(piece.first * kPackedOffsetBytes, piece.count * kPackedOffsetBytes));
  }
}

void PendingDistributions::clear() {
  last_ = nullptr;
  series_.clear();
  samples_ = 0;
  bytes_ = 0;
}

}  // namespace tavrel
