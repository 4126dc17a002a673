#include "report/rounding.h"

#include <gtest/gtest.h>
#include <limits>

namespace tavrel {
namespace {

constexpr std::int64_t kLargest = std::numeric_limits<std::int64_t>::max();
constexpr std::int64_t kSmallest = std::numeric_limits<std::int64_t>::min();

TEST(RoundingTest, RoundsToBuckets) {
  const struct {
    std::uint32_t width;
    std::int64_t value, rounded;
  } kCases[] = {
      {10, 14, 10},
      {10, 15, 20},
      {10, -7, 0},
      {10, -16, -10},
      {10, -25, -20},
      {3, 7, 6},
      {3, 8, 9},
      {0, -7, -7},
      {4294967295, 2147483648, 4294967295},
      {4294967295, 2147483647, 0},
      // The sum wraps beyond the largest integer.
      {10, kLargest, kSmallest + 8},
      {1, kLargest, kLargest},
      {10, kSmallest, kSmallest + 8},
  };
  for (const auto& c : kCases)
    EXPECT_EQ(roundToBucket(c.value, c.width), c.rounded) << c.value << " by " << c.width;
}

TEST(RoundingTest, KeepsSignificantFigures) {
  const struct {
    std::uint32_t figures;
    std::int64_t value, rounded;
  } kCases[] = {
      {2, 12345, 12000},
      {2, -12345, -12000},
      {2, 999, 1000},
      {2, 1049, 1000},
      {2, 1050, 1100},
      {4, 12355, 12360},
      {1, 150, 200},
      {1, 7, 7},
      {0, 7, 10},
      {0, 1, 1},
      {0, 3, 0},
      {5, 12345, 12345},
      {1, kLargest, 9000000000000000000},
      {1, kSmallest, -9000000000000000000},
      {0, kLargest, kLargest},
      {0, kSmallest, kSmallest},
      // Counts of figures are subtracted in 32 bits: these drop more figures than there are, or
      // so many that the power is no longer finite, or none.
      {4294967295, 12345, 0},
      {2147483664, 12345, 0},
      {2147483647, 12345, 12345},
  };
  for (const auto& c : kCases) {
    EXPECT_EQ(roundToSignificantFigures(c.value, c.figures), c.rounded)
        << c.value << " to " << c.figures;
  }
}

TEST(RoundingTest, RoundsToTheBucketFirst) {
  using plist::Dictionary;
  const struct {
    Dictionary options;
    std::int64_t value, rounded;
  } kCases[] = {
      {Dictionary::create(), 1234567, 1234567},
      {Dictionary{{"bucket_interval", 100}, {"sig_fig", 1}}, 149, 100},
      {Dictionary{{"bucket_interval", 100}, {"sig_fig", 1}}, 1450, 2000},
      {Dictionary{{"bucket_interval", "100"}, {"sig_fig", true}}, 149, 149},
      {Dictionary{{"bucket_interval", 10.9}}, 14, 10},
      {Dictionary{{"bucket_interval", -1}}, 2147483648, 4294967295},
      {Dictionary{{"intervals", plist::Array{1, 2}}}, 149, 149},
  };
  for (const auto& c : kCases)
    EXPECT_EQ(coarsened(c.value, c.options), c.rounded) << c.value;
}

}  // namespace
}  // namespace tavrel
