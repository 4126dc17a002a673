// The questions' arithmetic, checked against rational numbers and known values of Student's t.
#include <algorithm>
#include <cmath>
#include <gmock/gmock.h>
#include <limits>
#include <random>

#include "engine_records.h"
#include "fleet/questions/day_range.h"
#include "fleet/questions/grouping.h"
#include "fleet/questions/histogram.h"
#include "fleet/questions/merged_numbers.h"
#include "fleet/questions/scalar_histogram.h"
#include "fleet/questions/student.h"

namespace tavrel::fleet {
namespace {

using testing::ElementsAre;

constexpr double kInfinity = std::numeric_limits<double>::infinity();
constexpr double kNan = std::numeric_limits<double>::quiet_NaN();

struct Term {
  double mean;
  double squaredDeviations;
  std::uint64_t count;
};

// The expected numbers are quotients of Python's fractions.Fraction, rounded by int / int.
TEST(ExactMomentsTest, AreTheNearestDoublesInAnyOrder) {
  struct Case {
    std::vector<Term> terms;
    double mean;
    double squaredDeviations;
  };
  const Case cases[] = {
      {{{1e16, 0, 1}, {1, 0, 1}, {-1e16, 0, 1}}, 0x1.5555555555555p-2, 0x1.3b8b5b5056e17p+107},
      {{{0x1.dcd65p+29, 0, 1000},
        {0x1.dcd65000ccccdp+29, 0x1.3333333333333p-2, 1001},
        {0x1.dcd650019999ap+29, 0x1.3333333333333p-1, 1002},
        {0x1.dcd6500266666p+29, 0x1.cccccccccccccp-1, 1003},
        {0x1.dcd6500333333p+29, 0x1.3333333333333p+0, 1004}},
       0x1.dcd650019a024p+29,
       0x1.9ccc9235054f5p+6},
      {{{5e-324, 5e-324, 3}, {0x0.012688b70e62bp-1022, 0, 2}, {0, 0, 2}},
       0x0.0054270fbaf7ap-1022,
       5e-324},
      {{{1.7e308, 0, 8589934592}, {-1.7e308, 1e300, 8589934593}},
       -0x1.e42d1306faac2p+989,
       kInfinity},
      {{{1, 0, 1}, {2, 0, 1}, {2, 2.5, 1}}, 0x1.aaaaaaaaaaaabp+0, 0x1.9555555555555p+1},
      {{{1, 0, 1}, {0x1.0000000000001p+0, 0, 1}}, 1, 0x1p-105},
      {{{-0.0, 0, 4}}, 0, 0},
      {{{1, 0, UINT64_MAX - 1}, {3, 0, 1}}, 1, 4},
      // Cases that arithmetic does not define.
      {{}, kNan, kNan},
      {{{1, 0, UINT64_MAX}, {3, 0, 1}}, kNan, kNan},
  };
  std::mt19937 random(1);
  for (Case one : cases) {
    for (int shuffle = 0; shuffle < 4; ++shuffle) {
      SCOPED_TRACE(one.mean);
      ExactMoments moments;
      for (const Term& term : one.terms)
        moments.add(term.mean, term.squaredDeviations, term.count);
      EXPECT_EQ(bitsOf(moments.mean()), bitsOf(one.mean));
      EXPECT_EQ(bitsOf(moments.squaredDeviations()), bitsOf(one.squaredDeviations));
      std::shuffle(one.terms.begin(), one.terms.end(), random);
    }
  }
}

TEST(ExactMomentsTest, TakeIntegersWithoutLoss) {
  ExactMoments moments;
  for (const std::int64_t value :
       {INT64_MIN, std::int64_t{1} << 53, (std::int64_t{1} << 53) + 1, INT64_MAX})
    moments.add(value);
  EXPECT_EQ(moments.count(), 4u);
  EXPECT_EQ(moments.mean(), 0x1p+52);  // (2^54 + 1 - 1) / 4
}

TEST(ExactMomentsTest, RoundDifferencesOfMeansOnlyOnce) {
  ExactMoments before, after;
  EXPECT_TRUE(std::isnan(ExactMoments::differenceOfMeans(before, after)));
  for (const std::int64_t value : {INT64_MAX - 5, INT64_MAX - 4, INT64_MAX - 4})
    before.add(value);
  for (const std::int64_t value : {INT64_MAX, INT64_MAX - 1})
    after.add(value);
  EXPECT_EQ(ExactMoments::differenceOfMeans(before, after), 23 / 6.0);
  EXPECT_EQ(ExactMoments::differenceOfMeans(after, before), -23 / 6.0);
  before.add(-0x1p1000, 0, 1);
  after.add(0x1p1000, 0, 1);
  EXPECT_EQ(ExactMoments::differenceOfMeans(before, after), 0x1p1000 * 7 / 12);
}

TEST(MergedNumbersTest, KeepTheEndsInAnyOrder) {
  std::vector<FiveNumbers> all = {{0.0, 2, 1, 2, 2},        {-0.0, kInfinity, 1, 0, 1},
                                  {0, 0, 0, 0, 0},          {kNan, kNan, kNan, kNan, 1},
                                  {3, 3, 3, 0, UINT32_MAX}, {1, kNan, 1, kInfinity, 1}};
  std::sort(all.begin(), all.end(), [](const auto& a, const auto& b) { return a.count < b.count; });
  for (int turn = 0; turn < 6; ++turn) {
    MergedNumbers merged;
    for (const FiveNumbers& numbers : all)
      merged.add(numbers);
    EXPECT_EQ(bitsOf(merged.numbers().minimum), bitsOf(-0.0));
    EXPECT_EQ(merged.numbers().maximum, kInfinity);
    EXPECT_EQ(merged.numbers().count, 5ull + UINT32_MAX);
    // The mean of {1, 1}, 1 and 2^32 - 1 times 3, without the two that are not finite.
    EXPECT_EQ(merged.numbers().mean, (3 + 3.0 * UINT32_MAX) / (3.0 + UINT32_MAX));
    EXPECT_NEAR(*merged.standardDeviation(), std::sqrt(14.0 / (3.0 + UINT32_MAX)), 1e-12);
    EXPECT_EQ(merged.logsWithoutMean(), 2u);
    std::rotate(all.begin(), all.begin() + 1, all.end());
  }
  EXPECT_EQ(MergedNumbers().numbers().count, 0u);
  EXPECT_EQ(standardDeviation(18, 2), 3);
  EXPECT_EQ(standardDeviation(-1, 2), std::nullopt);
  EXPECT_EQ(standardDeviation(0, 0), std::nullopt);
}

TEST(HistogramTest, BoundsWhatDifferentBoundariesLeaveOpen) {
  const std::vector<Cell> cells = {{-kInfinity, 10, 4}, {10, 20, 6}, {20, kInfinity, 2},
                                   {-kInfinity, 15, 3}, {15, 20, 1}, {10, 20, 5}};
  EXPECT_THAT(piecesOf(cells), ElementsAre(Piece{-kInfinity, 10, 4, 7}, Piece{10, 15, 0, 14},
                                           Piece{15, 20, 1, 12}, Piece{20, kInfinity, 2, 2}));
  EXPECT_EQ(valuesOf(cells), 21u);
  // Ranks 2, 6, 11, 16 and 20 of 21.
  const unsigned percents[] = {5, 25, 50, 75, 95};
  EXPECT_THAT(percentilesOf(cells, percents),
              ElementsAre(Interval{-kInfinity, 10}, Interval{-kInfinity, 15}, Interval{10, 20},
                          Interval{10, 20}, Interval{20, kInfinity}));
  EXPECT_TRUE(percentilesOf({}, percents).empty());
  EXPECT_THAT(piecesOf(std::vector<Cell>{{0, 1, UINT64_MAX}, {0, 1, 1}, {0, 2, 1}, {1, 2, 0}}),
              ElementsAre(Piece{0, 1, UINT64_MAX, UINT64_MAX}, Piece{1, 2, 0, 1}));
  EXPECT_EQ(nearestRank(UINT64_MAX, 100), UINT64_MAX);
  EXPECT_EQ(nearestRank(20, 5), 1u);
  EXPECT_EQ(nearestRank(21, 5), 2u);
}

TEST(HistogramTest, DividesScalarsAtRoundNumbers) {
  std::vector<std::int64_t> values;
  for (int i = 0; i < 1000; ++i)
    values.push_back(i);
  const auto boundaries = roundBoundaries(values);
  EXPECT_EQ(boundaries.front(), 0);
  EXPECT_EQ(boundaries.back(), 1000);
  EXPECT_EQ(boundaries.size(), 11u);
  EXPECT_EQ(bucketOf(boundaries, 100), (Cell{0, 100, 1}));
  EXPECT_EQ(bucketOf(boundaries, INT64_MIN), (Cell{-kInfinity, 0, 1}));
  EXPECT_EQ(bucketOf(boundaries, 1001), (Cell{1000, kInfinity, 1}));
  // Values that have no double of their own.
  const double large[] = {-0x1p63, 0x1p62, 0x1p63};
  EXPECT_EQ(bucketOf(large, (std::int64_t{1} << 62) + 1), (Cell{0x1p62, 0x1p63, 1}));
  EXPECT_EQ(bucketOf(large, INT64_MAX), (Cell{0x1p62, 0x1p63, 1}));
  EXPECT_EQ(bucketOf(large, INT64_MIN), (Cell{-kInfinity, -0x1p63, 1}));
  const std::int64_t extremes[] = {INT64_MIN, INT64_MAX};
  EXPECT_LT(roundBoundaries(extremes).size(), 30u);
  const std::int64_t alike[] = {INT64_MAX, INT64_MAX};
  EXPECT_GE(roundBoundaries(alike).size(), 1u);
}

// Known values from mpmath's incomplete beta function with 30 digits.
TEST(StudentTest, AgreesWithKnownValues) {
  const double probabilities[][3] = {{2.776445105197793, 4, 0.050000000000000071},
                                     {1, 1, 0.5},
                                     {0.001, 7, 0.99923001724499884},
                                     {3.5, 2.5, 0.052345546960320337},
                                     {12, 1000, 4.3240573867745275e-31},
                                     {-1.96, 1e6, 0.049996067585269791},
                                     {40, 3, 3.4380680789158528e-5},
                                     {6, 99999.5, 1.9799294894224779e-9},
                                     {2, 0.7, 0.36914815166652257},
                                     {2, 2e8, 0.04550026524613258}};
  for (const auto& [t, freedom, expected] : probabilities) {
    EXPECT_NEAR(studentTwoSided(t, freedom) / expected, 1, 4e-8) << t << " " << freedom;
  }
  EXPECT_EQ(studentTwoSided(0, 5), 1);
  EXPECT_EQ(studentTwoSided(kInfinity, 5), 0);
  const double quantiles[][3] = {{0.05, 1, 12.706204736174704},
                                 {0.05, 4, 2.7764451051977943},
                                 {0.05, 30, 2.0422724563012383},
                                 {0.01, 7.5, 3.4214226881240444},
                                 {0.05, 1e6, 1.959966356814107}};
  for (const auto& [probability, freedom, expected] : quantiles) {
    EXPECT_NEAR(studentQuantile(probability, freedom) / expected, 1, 1e-9) << freedom;
  }
  EXPECT_THAT(holm(std::vector<double>{0.01, 0.04, 0.03, 0.005, 0.9}),
              ElementsAre(0.04, testing::DoubleEq(0.09), 0.09, 0.025, 0.9));
}

TEST(DayRangeTest, ReadsWhatPeopleWrite) {
  const auto read = [](const char* text) {
    const auto days = parseDayRange(text, 20781);
    return days ? textOf(*days) : days.error().message;
  };
  EXPECT_EQ(read("2026-11-01..2026-11-07"), "2026-11-01..2026-11-07");
  EXPECT_EQ(read("2026-11-24"), "2026-11-24");
  EXPECT_EQ(read("7"), "2026-11-18..2026-11-24");
  EXPECT_EQ(read("1"), "2026-11-24");
  EXPECT_EQ(read("..2026-11-07"), "..2026-11-07");
  EXPECT_EQ(read(".."), "all days");
  EXPECT_EQ(read("2026-11-07..2026-11-01"),
            "\"2026-11-07..2026-11-01\" ends before it begins: swap the two days");
  for (const char* wrong : {"", "0", "-1", "x", "2026-11-31", "2026-11-01..x", "99999999999"}) {
    EXPECT_EQ(read(wrong), "\"" + std::string(wrong) +
                               "\" is not a range of days: write FIRST..LAST with days as "
                               "YYYY-MM-DD, or a number of days");
  }
  std::vector<std::string> versions = {
      "Pellio 4.10 (A)", "Pellio 4.9 (B)", "Pellio 4.09 (A)", "Pellio 4", "", "10", "9"};
  std::sort(versions.begin(), versions.end(), versionLess);
  EXPECT_THAT(versions, ElementsAre("", "9", "10", "Pellio 4", "Pellio 4.09 (A)", "Pellio 4.9 (B)",
                                    "Pellio 4.10 (A)"));
}

}  // namespace
}  // namespace tavrel::fleet
