// Boundaries of every kind and order, and values with any bits. The binary search must find the
// bucket where a plain walk stops, and the histogram's labels must keep the buckets apart.
//
// Input: the number of boundaries, 9 bytes for each (kind and bits), the values.
#include <algorithm>
#include <bit>
#include <cstdint>
#include <limits>
#include <numeric>
#include <vector>

#include "base/bytes.h"
#include "report/histogram.h"
#include "require.h"

using namespace tavrel;
using fuzz::require;

namespace {

constexpr std::size_t kBoundaryBytes = 9;

/// Adds a boundary to the list, and the number that it compares as; a boundary that is
/// not a number stops no value.
void addBoundary(unsigned kind, std::uint64_t bits, plist::Array& list,
                 std::vector<double>& numbers) {
  constexpr double kNone = std::numeric_limits<double>::quiet_NaN();
  const auto word = std::bit_cast<std::int64_t>(bits);
  switch (kind % 8) {
    case 0:
      list.append(word);
      return numbers.push_back(static_cast<double>(word));
    case 1:
      list.append(bits);
      return numbers.push_back(static_cast<double>(bits));
    case 2:
      list.append(static_cast<std::int8_t>(word));
      return numbers.push_back(static_cast<std::int8_t>(word));
    case 3:
      list.append("7");
      return numbers.push_back(kNone);
    case 4:
      list.append(plist::Array::create());
      return numbers.push_back(kNone);
    default:
      list.append(std::bit_cast<double>(bits));
      return numbers.push_back(std::bit_cast<double>(bits));
  }
}

std::uint32_t walk(double value, const std::vector<double>& boundaries) {
  for (std::uint32_t i = 0; i < boundaries.size(); ++i) {
    if (boundaries[i] >= value) return i;
  }
  return static_cast<std::uint32_t>(boundaries.size());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const ByteSpan input = std::as_bytes(std::span(data, size));
  const std::size_t count = loadByte(input, 0).value_or(0);
  plist::Array list = plist::Array::create();
  std::vector<double> boundaries;
  for (std::size_t i = 0; i < count; ++i) {
    const std::size_t at = 1 + i * kBoundaryBytes;
    const auto bits = loadLittle64(input, at + 1);
    if (!bits) return 0;
    addBoundary(*loadByte(input, at), *bits, list, boundaries);
  }

  auto histogram = Histogram::create(list);
  require(histogram && histogram->counts().size() == count + 1);
  std::vector<std::uint32_t> counts(count + 1);
  const auto check = [&](double value) {
    const std::uint32_t bucket = walk(value, boundaries);
    require(histogram->bucketOf(value) == bucket);
    require(determineHistBucketForValue(value, list) == bucket);
    histogram->count(value);
    ++counts[bucket];
  };
  for (std::size_t at = 1 + count * kBoundaryBytes; const auto bits = loadLittle64(input, at);
       at += sizeof *bits) {
    check(std::bit_cast<double>(*bits));
  }
  for (const double boundary : boundaries) {
    check(boundary);
    check(std::bit_cast<double>(std::bit_cast<std::uint64_t>(boundary) ^ 1U));  // its neighbour
  }

  require(std::equal(counts.begin(), counts.end(), histogram->counts().begin()));
  const plist::Dictionary labelled = histogramDictForIntervals(list, counts);
  std::size_t filled = 0;
  std::uint64_t sum = 0;
  for (const std::uint32_t counted : counts)
    filled += counted != 0 ? 1 : 0;
  for (const plist::Entry& entry : labelled)
    sum += entry.value.number()->uint32();
  require(filled == 0 ? !labelled : labelled.size() == filled);
  require(sum == std::accumulate(counts.begin(), counts.end(), std::uint64_t{0}));
  return 0;
}
