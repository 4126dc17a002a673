#include "report/histogram.h"

#include <cmath>
#include <gtest/gtest.h>
#include <limits>

#include "tests/helpers/plist_matching.h"

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

// The prepared search and the plain walk agree, even for boundaries that are unordered, equal,
// infinite, not-a-number, not numbers at all, or integers too large for a double.
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
  // Labels cached for other boundaries, which are equal only in value, are not used for these.
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

}  // namespace
}  // namespace tavrel
