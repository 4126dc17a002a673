#include "fleet/questions/show.h"

#include <algorithm>
#include <limits>

#include "base/arithmetic.h"
#include "fleet/questions/cell_classes.h"
#include "fleet/questions/day_range.h"
#include "fleet/questions/exact_moments.h"
#include "fleet/questions/merged_numbers.h"
#include "fleet/questions/scalar_histogram.h"

namespace tavrel::fleet {

namespace {

constexpr double kInfinity = std::numeric_limits<double>::infinity();
constexpr double kNan = std::numeric_limits<double>::quiet_NaN();

/// The rows of the key, ordered by log. Distributions without values are left out.
struct Rows {
  std::vector<std::pair<LogIndex, std::int64_t>> scalars;
  std::vector<std::pair<LogIndex, FiveNumbers>> distributions;
  std::vector<std::pair<LogIndex, Cell>> cells;
};

Rows readRows(Engine& engine, const LogTable& table, const ShowRequest& request) {
  Rows rows;
  if (request.kind == KeyKind::Scalar) {
    engine.scalars(request.key, [&](std::span<const ScalarValue> values) {
      for (const ScalarValue& row : values) {
        const LogIndex log = table.find(row.log);
        if (log != kNoLog) rows.scalars.emplace_back(log, row.value);
      }
    });
    return rows;
  }
  engine.distributions(request.key, [&](std::span<const DistributionValue> values) {
    for (const DistributionValue& row : values) {
      const LogIndex log = table.find(row.log);
      if (log != kNoLog && row.numbers.count != 0) {
        rows.distributions.emplace_back(log, row.numbers);
      }
    }
  });
  engine.cells(request.key, [&](std::span<const CellValue> values) {
    for (const CellValue& row : values) {
      const LogIndex log = table.find(row.log);
      if (log != kNoLog) rows.cells.emplace_back(log, Cell{row.lower, row.upper, row.count});
    }
  });
  return rows;
}

/// Describes the parts of one side.
class SideAnswer {
 public:
  SideAnswer(Ledger& ledger, const Rows& rows, std::string subjectOfMeans)
      : ledger_(ledger),
        table_(ledger.table()),
        rows_(rows),
        subjectOfMeans_(std::move(subjectOfMeans)) {}

  ShowSide answer(std::string title, const Division& division) {
    ShowSide side{
        .title = std::move(title), .isShown = division.isShown, .whole = {}, .groups = {}};
    if (!side.isShown) return side;
    side.joined = division.joined;

    // Without groups, the whole is the only part.
    std::vector<Group> parts = division.groups;
    if (parts.empty()) parts.push_back({{PartKind::Whole}, division.whole});
    partOf_.assign(table_.size(), parts.size());
    for (std::size_t part = 0; part < parts.size(); ++part) {
      parts[part].logs.forEach([&](LogIndex log) { partOf_[log] = part; });
    }
    std::vector<ShownSet> sets;
    sets.reserve(parts.size());
    for (const Group& part : parts)
      sets.push_back(setOf(part.name, part.logs));
    side.whole = setOf({PartKind::Whole}, division.whole);

    spread(sets, side.whole);
    merge(sets, side.whole);
    fillHistograms(sets, side.whole);
    if (!division.groups.empty()) side.groups = std::move(sets);
    return side;
  }

 private:
  ShownSet setOf(const PartName& name, const LogSet& logs) const {
    return {name, logs.logs(), logs.devices(table_), std::nullopt, std::nullopt, {}};
  }

  /// Hands out the values of the whole and then of each part of the side.
  template <class Value, class Use>
  void forEachPart(const std::vector<std::pair<LogIndex, Value>>& rows, std::vector<ShownSet>& sets,
                   ShownSet& whole, const Use& use) const {
    if (rows.empty()) return;
    std::vector<std::vector<const std::pair<LogIndex, Value>*>> ofPart(sets.size() + 1);
    for (const auto& row : rows) {
      const std::size_t part = partOf_[row.first];
      if (part == sets.size()) continue;
      ofPart[part].push_back(&row);
      ofPart.back().push_back(&row);
    }
    use(ofPart.back(), whole);
    for (std::size_t i = 0; i < sets.size(); ++i)
      use(ofPart[i], sets[i]);
  }

  void spread(std::vector<ShownSet>& sets, ShownSet& whole) const {
    forEachPart(rows_.scalars, sets, whole, [](const auto& rows, ShownSet& set) {
      ExactMoments moments;
      std::vector<std::int64_t> values;
      for (const auto* row : rows) {
        moments.add(row->second);
        values.push_back(row->second);
      }
      std::sort(values.begin(), values.end());
      ScalarSpread spread{
          values.front(), values.back(), moments.mean(), moments.squaredDeviations(), {}};
      for (std::size_t i = 0; i < kPercents.size(); ++i) {
        spread.percentiles[i] =
            values[static_cast<std::size_t>(nearestRank(values.size(), kPercents[i])) - 1];
      }
      set.scalar = spread;
    });
  }

  void merge(std::vector<ShownSet>& sets, ShownSet& whole) const {
    forEachPart(rows_.distributions, sets, whole, [&](const auto& rows, ShownSet& set) {
      MergedNumbers merged;
      LogMarks marks(table_);
      for (const auto* row : rows) {
        merged.add(row->second);
        if (hasMean(row->second)) marks.insert(row->first);
      }
      const LogSet withMean = marks.set();
      set.merged = {merged.numbers(), merged.standardDeviation(), merged.logsWithoutMean()};
      if (ledger_.allows(subjectOfMeans_, withMean)) {
        ledger_.noteShown(subjectOfMeans_, withMean);
        return;
      }
      set.merged->numbers.mean = set.merged->numbers.squaredDeviations = kNan;
      set.merged->deviation = std::nullopt;
    });
  }

  /// The histogram of the whole is made of the parts' cells after these were coarsened, so
  /// subtracting parts from it reveals nothing new.
  void fillHistograms(std::vector<ShownSet>& sets, ShownSet& whole) const {
    const std::vector<double> boundaries = scalarBoundaries(sets.size());
    std::vector<CellClasses> classes(sets.size(), CellClasses(table_));
    for (const auto& [log, value] : rows_.scalars) {
      if (partOf_[log] != sets.size()) classes[partOf_[log]].add(log, bucketOf(boundaries, value));
    }
    std::vector<std::uint64_t> counted(rows_.cells.empty() ? 0 : table_.size());
    for (const auto& [log, cell] : rows_.cells) {
      if (partOf_[log] == sets.size()) continue;
      classes[partOf_[log]].add(log, cell);
      if (cell.lower < cell.upper) counted[log] = saturatingAdd(counted[log], cell.count);
    }
    // Values that no histogram counts may lie anywhere. Without them, the histogram would cover
    // other logs than the five numbers do.
    for (const auto& [log, numbers] : rows_.distributions) {
      if (partOf_[log] == sets.size() || counted.empty() || counted[log] >= numbers.count) continue;
      classes[partOf_[log]].add(log, {-kInfinity, kInfinity, numbers.count - counted[log]});
    }
    std::vector<Cell> all;
    HistogramAnswer& total = whole.histogram;
    for (std::size_t i = 0; i < sets.size(); ++i) {
      const CellClasses::Coarsened coarsened = classes[i].coarsened(ledger_.devicesAtLeast());
      fill(sets[i].histogram, coarsened.cells);
      sets[i].histogram.isJoined = coarsened.isJoined;
      all.insert(all.end(), coarsened.cells.begin(), coarsened.cells.end());
      total.isJoined = total.isJoined || sets[i].histogram.isJoined;
    }
    fill(total, all);
  }

  std::vector<double> scalarBoundaries(std::size_t parts) const {
    std::vector<std::int64_t> values;
    for (const auto& [log, value] : rows_.scalars) {
      if (partOf_[log] != parts) values.push_back(value);
    }
    std::sort(values.begin(), values.end());
    return values.empty() ? std::vector<double>() : roundBoundaries(values);
  }

  void fill(HistogramAnswer& answer, const std::vector<Cell>& cells) const {
    // One bucket over all numbers would say nothing.
    if (std::all_of(cells.begin(), cells.end(), [](const Cell& cell) {
          return cell.lower == -kInfinity && cell.upper == kInfinity;
        })) {
      return;
    }
    answer.values = valuesOf(cells);
    answer.pieces = piecesOf(cells);
    if (rows_.scalars.empty()) answer.percentiles = percentilesOf(cells, kPercents);
  }

  Ledger& ledger_;
  const LogTable& table_;
  const Rows& rows_;
  const std::string subjectOfMeans_;
  std::vector<std::size_t> partOf_;  // of each log; the number of parts when it is in none
};

/// The logs that have the key and that the request puts on a given side.
LogSet logsOf(const LogTable& table, const Rows& rows, const auto& isOnSide) {
  LogMarks logs(table);
  const auto take = [&](const auto& some) {
    for (const auto& [log, value] : some) {
      if (isOnSide(log)) logs.insert(log);
    }
  };
  take(rows.scalars);
  take(rows.distributions);
  return logs.set();
}

}  // namespace

ShowAnswer show(Engine& engine, Ledger& ledger, const ShowRequest& request) {
  const LogTable& table = ledger.table();
  const Rows rows = readRows(engine, table, request);
  const std::string subject = subjectOf(request.kind, request.key);
  SideAnswer answers(ledger, rows, subjectOfMeans(request.kind, request.key));
  ShowAnswer answer{request, ledger.devicesAtLeast(), {}};

  const auto addSide = [&](std::string title, const auto& isOnSide) {
    const LogSet logs = logsOf(table, rows, isOnSide);
    std::vector<Group> groups = groupsOf(table, logs, request.by, ledger.devicesAtLeast());
    if (request.leavesSmallOut) leaveSmallOut(groups, ledger);
    Division division = divide(ledger, subject, std::move(groups));
    if (request.by == GroupBy::None) division.groups.clear();
    answer.sides.push_back(answers.answer(std::move(title), division));
  };
  const auto isOfVersion = [&](LogIndex log) {
    return table.texts(Attribute::Os)[table.attribute(Attribute::Os, log)] ==
           *request.againstVersion;
  };
  addSide(request.againstVersion ? "all other versions" : textOf(request.days), [&](LogIndex log) {
    return request.days.contains(table.day(log)) && !(request.againstVersion && isOfVersion(log));
  });
  if (request.againstVersion) {
    addSide("version " + *request.againstVersion, [&](LogIndex log) {
      return request.days.contains(table.day(log)) && isOfVersion(log);
    });
  }
  if (request.againstDays) {
    addSide(textOf(*request.againstDays),
            [&](LogIndex log) { return request.againstDays->contains(table.day(log)); });
  }
  return answer;
}

}  // namespace tavrel::fleet
