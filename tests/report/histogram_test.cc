#include "report/histogram.h"

#include <cmath>
#include <gtest/gtest.h>
#include <limits>

#include "report/rounding.h"
#include "tests/fakes/plist_matching.h"

namespace tavrel {
namespace {

constexpr double kInfinity = std::numeric_limits<double>::infinity();
const double kNotANumber = std::nan("");

TEST(HistogramTest, PutsValuesWhereTheFirstBoundaryNotBelowThemStands) {
  const plist::Array boundaries{10, 20};
  const std::pair<double, std::uint32_t> kCases[] = {
      {5, 0},  {10, 0},        {15, 1},         {20, 1},
      {25, 2}, {kInfinity, 2}, {-kInfinity, 0}, {kNotANumber, 2}};
  for (const auto& [value, index] : kCases)
    EXPECT_EQ(determineHistBucketForValue(value, boundaries), index) << value;
  EXPECT_EQ(determineHistBucketForValue(0, plist::Array{}), 0U);
}

// The prepared search and the plain walk agree, also for boundaries that are unordered, equal,
// infinite, not-a-number, no numbers at all, or integers that a double cannot hold.
TEST(HistogramTest, SearchesAsTheWalkDoes) {
  const plist::Array kLists[] = {
      plist::Array::create(),
      {1},
      {1, 2, 3, 4, 5, 6, 7},
      {5, 3, 8, 8, 1, 9, 2},
      {kNotANumber, 2, kNotANumber, 4},
      {kNotANumber},
      {"text", 3, true, 7.5},
      {-kInfinity, 0, kInfinity, 5},
      {-0.0, 0.0, 4.9e-324},
      {std::int64_t{9007199254740993}, std::uint64_t{18446744073709551615U}}};
  for (const plist::Array& list : kLists) {
    const auto histogram = Histogram::create(list);
    ASSERT_TRUE(histogram);
    for (const plist::Array& others : kLists) {
      for (const plist::Value& boundary : others) {
        const double at = boundary.number() ? boundary.number()->real() : 0;
        for (const double value :
             {std::nextafter(at, -kInfinity), at, std::nextafter(at, kInfinity)})
          EXPECT_EQ(histogram->bucketOf(value), determineHistBucketForValue(value, list)) << value;
      }
    }
  }
}

TEST(HistogramTest, LabelsTheBucketsThatCounted) {
  using plist::Dictionary;
  const std::uint32_t kCounts[] = {2, 0, 1, 4294967295};
  EXPECT_EQ(histogramDictForIntervals(plist::Array{10, 12.5, 1e300}, kCounts),
            (Dictionary{{"(-inf, 10]", 2}, {"(12.5, 1e+300]", 1}, {"(1e+300, inf)", 4294967295}}));
  const std::uint32_t kOne[] = {3};
  EXPECT_EQ(histogramDictForIntervals(plist::Array{}, kOne), (Dictionary{{"(-inf, inf)", 3}}));
  // Labels that are kept from other boundaries, equal in value only, are not given for these.
  HistogramLabels labels;
  const std::uint32_t kBoth[] = {1, 1};
  for (const auto& [boundary, text] : {std::pair<plist::Value, const char*>{1, "(-inf, 1]"},
                                       {0, "(-inf, 0]"},
                                       {-0.0, "(-inf, -0]"},
                                       {"0", "(-inf, 0]"},
                                       {"x", "(-inf, x]"}})
    EXPECT_TRUE(histogramDictForIntervals(plist::Array{boundary}, kBoth, labels).contains(text))
        << text;
  const std::uint32_t kNone[] = {0, 0};
  EXPECT_FALSE(histogramDictForIntervals(plist::Array{1}, kNone));
}

// The sum wraps beyond the largest integer.
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
