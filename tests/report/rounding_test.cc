#include "report/rounding.h"

#include <gtest/gtest.h>

namespace tavrel {
namespace {

// The sum wraps around beyond the largest integer.
TEST(RoundingTest, RoundsToBuckets) {
  using Case = std::tuple<std::uint32_t, std::int64_t, std::int64_t>;
  for (const auto& [width, value, rounded] :
       {Case(10, 14, 10), Case(10, 15, 20), Case(10, -7, 0), Case(10, -16, -10), Case(10, -25, -20),
        Case(3, 7, 6), Case(3, 8, 9), Case(0, -7, -7), Case(4294967295, 2147483648, 4294967295),
        Case(4294967295, 2147483647, 0), Case(10, INT64_MAX, INT64_MIN + 8),
        Case(1, INT64_MAX, INT64_MAX), Case(10, INT64_MIN, INT64_MIN + 8)})
    EXPECT_EQ(roundToBucket(value, width), rounded) << value << " by " << width;
}

TEST(RoundingTest, KeepsSignificantFigures) {
  using Case = std::tuple<std::uint32_t, std::int64_t, std::int64_t>;
  for (const auto& [figures, value, rounded] :
       {Case(2, 12345, 12000), Case(2, -12345, -12000), Case(2, 999, 1000), Case(2, 1049, 1000),
        Case(2, 1050, 1100), Case(4, 12355, 12360), Case(1, 150, 200), Case(1, 7, 7),
        Case(0, 7, 10), Case(0, 1, 1), Case(0, 3, 0), Case(5, 12345, 12345),
        Case(1, INT64_MAX, 9000000000000000000), Case(1, INT64_MIN, -9000000000000000000),
        Case(0, INT64_MAX, INT64_MAX), Case(0, INT64_MIN, INT64_MIN),
        // Counts of figures are subtracted in 32 bits: these drop more figures than there are, or
        // so many that the power is no longer finite, or none.
        Case(4294967295, 12345, 0), Case(2147483664, 12345, 0), Case(2147483647, 12345, 12345),
        Case(16, 9007199254740993, 9007199254740993)})
    EXPECT_EQ(roundToSignificantFigures(value, figures), rounded) << value << " to " << figures;
}

TEST(RoundingTest, RoundsToTheBucketFirst) {
  using plist::Dictionary;
  const Dictionary both{{"bucket_interval", 100}, {"sig_fig", 1}};
  using Case = std::tuple<Dictionary, std::int64_t, std::int64_t>;
  for (const auto& [options, value, rounded] :
       {Case(Dictionary::create(), 1234567, 1234567), Case(both, 149, 100), Case(both, 1450, 2000),
        Case({{"bucket_interval", "100"}, {"sig_fig", true}}, 149, 149),
        Case({{"bucket_interval", 10.9}}, 14, 10),
        Case({{"bucket_interval", -1}}, 2147483648, 4294967295),
        Case({{"intervals", plist::Array{1, 2}}}, 149, 149)})
    EXPECT_EQ(coarsened(value, options), rounded) << value;
}

}  // namespace
}  // namespace tavrel
