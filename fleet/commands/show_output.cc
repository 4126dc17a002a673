#include "fleet/commands/show_output.h"

#include <algorithm>
#include <cmath>
#include <nlohmann/json.hpp>
#include <ostream>

#include "base/text.h"
#include "catalogue/catalogue.h"
#include "fleet/commands/csv_writer.h"
#include "fleet/commands/question.h"
#include "fleet/questions/merged_numbers.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"

namespace tavrel::fleet {

namespace {

/// The figures that both kinds of statistics have.
struct Figures {
  std::uint64_t values = 0;
  double minimum = 0;
  double maximum = 0;
  double mean = 0;
  double squaredDeviations = 0;
  std::optional<double> deviation;
  std::size_t logsWithoutMean = 0;
};

Figures figuresOf(const ShownSet& set) {
  if (set.scalar) {
    const ScalarSpread& spread = *set.scalar;
    return {set.logs,
            static_cast<double>(spread.minimum),
            static_cast<double>(spread.maximum),
            spread.mean,
            spread.squaredDeviations,
            standardDeviation(spread.squaredDeviations, set.logs),
            0};
  }
  const MergedAnswer merged = set.merged.value_or(MergedAnswer{});
  const FiveNumbers& numbers = merged.numbers;
  return {numbers.count,         numbers.minimum,           numbers.maximum,
          numbers.mean,          numbers.squaredDeviations, merged.deviation,
          merged.logsWithoutMean};
}

std::string intervalText(const Interval& interval) {
  if (std::isinf(interval.lower) && std::isinf(interval.upper)) return "?";
  // Shortened, two ends could look alike.
  if (std::isinf(interval.lower)) return "≤ " + numberText(interval.upper);
  if (std::isinf(interval.upper)) return "> " + numberText(interval.lower);
  return numberText(interval.lower) + " to " + numberText(interval.upper);
}

std::string percentileText(const ShownSet& set, std::size_t index) {
  if (set.scalar) return std::to_string(set.scalar->percentiles[index]);
  return index < set.histogram.percentiles.size() ? intervalText(set.histogram.percentiles[index])
                                                  : "";
}

/// Each set of a side: the whole, then its groups.
template <class Use>
void forEachSet(const ShowSide& side, const Use& use) {
  if (!side.isShown) return;
  use(side.whole);
  for (const ShownSet& group : side.groups)
    use(group);
}

void printFigures(FleetContext& context, const ShowSide& side, std::size_t devicesAtLeast) {
  using Align = Table::Align;
  std::vector<Table::Column> columns = {
      {"", Align::Whole},           {"DEVICES", Align::Right},         {"LOGS", Align::Right, 6},
      {"VALUES", Align::Right, 5},  {"MINIMUM", Align::Right, 3},      {"MEAN", Align::Right},
      {"MAXIMUM", Align::Right, 3}, {"STD DEVIATION", Align::Right, 7}};
  bool hasPercentiles = false;
  bool areLeftOut = false;
  bool isMissing = false;
  forEachSet(side, [&](const ShownSet& set) {
    const Figures figures = figuresOf(set);
    hasPercentiles = hasPercentiles || set.scalar || !set.histogram.percentiles.empty();
    areLeftOut = areLeftOut || figures.logsWithoutMean != 0;
    isMissing = isMissing || std::isnan(figures.mean) || std::isnan(figures.minimum) ||
                std::isnan(figures.maximum) || !figures.deviation;
  });
  for (const unsigned percent : kPercents) {
    const unsigned rank = percent == 50 ? 0 : percent == 25 || percent == 75 ? 4 : 2;
    if (hasPercentiles) columns.push_back({std::to_string(percent) + " %", Align::Right, rank});
  }
  if (areLeftOut) columns.push_back({"NO MEAN", Align::Right});
  Table table(std::move(columns), 2);
  forEachSet(side, [&](const ShownSet& set) {
    const Figures figures = figuresOf(set);
    const bool isScalar = set.scalar.has_value();
    std::vector<Table::Cell> cells = {
        set.name.text(),
        std::to_string(set.devices),
        std::to_string(set.logs),
        std::to_string(figures.values),
        isScalar ? std::to_string(set.scalar->minimum) : figureText(figures.minimum),
        figureText(figures.mean),
        isScalar ? std::to_string(set.scalar->maximum) : figureText(figures.maximum),
        figures.deviation ? shortNumber(*figures.deviation) : "-"};
    for (std::size_t i = 0; hasPercentiles && i < kPercents.size(); ++i)
      cells.push_back(percentileText(set, i));
    cells.push_back(std::to_string(figures.logsWithoutMean));
    table.add(std::move(cells));
  });
  table.print(context.page());
  if (areLeftOut) context.out() << "  " << noMeanText() << "\n";
  if (isMissing) {
    context.out() << "  A figure is - when no log has it, or logs of fewer than " << devicesAtLeast
                  << " devices,\n  or when it is beyond the range of a double.\n";
  }
}

void printHistogram(FleetContext& context, const HistogramAnswer& histogram,
                    std::size_t devicesAtLeast) {
  if (histogram.pieces.empty()) return;
  std::uint64_t largest = 1;
  bool isRange = false;
  for (const Piece& piece : histogram.pieces) {
    largest = std::max(largest, piece.most);
    isRange = isRange || piece.least != piece.most;
  }
  Table table({{"", Table::Align::Whole}, {"", Table::Align::Right}, {"", Table::Align::Bar}}, 2);
  for (const Piece& piece : histogram.pieces) {
    const std::string count = piece.least == piece.most ? std::to_string(piece.least)
                                                        : std::to_string(piece.least) + " to " +
                                                              std::to_string(piece.most);
    table.add({bucketText(piece.lower, piece.upper), count,
               Table::Cell::bar(static_cast<double>(piece.least), static_cast<double>(largest))});
  }
  table.print(context.page());
  if (histogram.isJoined) {
    context.out() << "  Buckets of fewer than " << devicesAtLeast
                  << " devices are joined with their neighbours.\n";
  }
  if (isRange) {
    context.out() << "  A count is a range where logs have other boundaries, or no histogram.\n";
  }
}

void printBuckets(FleetContext& context, const ShowSide& side, std::size_t devicesAtLeast) {
  bool isFirst = true;
  forEachSet(side, [&](const ShownSet& set) {
    context.out() << (isFirst ? "" : "\n") << "  " << printable(set.name.text()) << "\n";
    isFirst = false;
    if (set.histogram.pieces.empty()) context.out() << "  no histogram\n";
    printHistogram(context, set.histogram, devicesAtLeast);
  });
}

Json setJson(const ShownSet& set) {
  const Figures figures = figuresOf(set);
  Json json = partJson(set.name);
  json["devices"] = set.devices;
  json["logs"] = set.logs;
  json["values"] = figures.values;
  if (set.scalar) {
    json["minimum"] = set.scalar->minimum;
    json["maximum"] = set.scalar->maximum;
  } else {
    json["minimum"] = realJson(figures.minimum);
    json["maximum"] = realJson(figures.maximum);
  }
  json["mean"] = realJson(figures.mean);
  json["squared_deviations"] = realJson(figures.squaredDeviations);
  json["standard_deviation"] = figures.deviation ? realJson(*figures.deviation) : Json(nullptr);
  if (set.merged) json["logs_without_mean"] = figures.logsWithoutMean;
  Json percentiles = Json::array();
  const HistogramAnswer& histogram = set.histogram;
  for (std::size_t i = 0; i < kPercents.size(); ++i) {
    if (set.scalar) {
      percentiles.push_back({{"percent", kPercents[i]}, {"value", set.scalar->percentiles[i]}});
    } else if (i < histogram.percentiles.size()) {
      percentiles.push_back({{"percent", kPercents[i]},
                             {"above", realJson(histogram.percentiles[i].lower)},
                             {"at_most", realJson(histogram.percentiles[i].upper)}});
    }
  }
  json["percentiles"] = std::move(percentiles);
  Json pieces = Json::array();
  for (const Piece& piece : histogram.pieces) {
    pieces.push_back({{"above", realJson(piece.lower)},
                      {"at_most", realJson(piece.upper)},
                      {"least", piece.least},
                      {"most", piece.most}});
  }
  json["histogram"] = {
      {"values", histogram.values}, {"buckets", std::move(pieces)}, {"joined", histogram.isJoined}};
  return json;
}

/// The first columns of a row.
void addNames(CsvWriter& csv, const ShowAnswer& answer, const ShowSide& side, const ShownSet& set) {
  csv.text(answer.request.key).title(kindText(answer.request.kind)).text(side.title);
  csv.title(kindText(set.name)).text(set.name.value);
}

}  // namespace

std::string bucketText(double lower, double upper) {
  return "(" + (std::isinf(lower) ? "-inf" : numberText(lower)) + ", " +
         (std::isinf(upper) ? "inf)" : numberText(upper) + "]");
}

void printShown(FleetContext& context, const ShowAnswer& answer, bool buckets) {
  std::ostream& out = context.out();
  const std::string& key = answer.request.key;
  out << printable(key) << ": " << kindText(answer.request.kind);
  if (const catalogue::Entry* entry = catalogue::findStatistic(key)) {
    if (!entry->unit.empty()) out << " (" << entry->unit << ')';
    if (!entry->meaning.empty()) out << "\n" << entry->meaning;
  }
  out << "\n";
  for (const ShowSide& side : answer.sides) {
    out << "\n" << context.page().styled(printable(side.title), Emphasis::Strong) << "\n";
    if (!side.isShown) {
      out << "  " << tooFewText(answer.devicesAtLeast) << "\n";
      continue;
    }
    if (buckets) {
      printBuckets(context, side, answer.devicesAtLeast);
    } else {
      printFigures(context, side, answer.devicesAtLeast);
    }
    const std::string joined = joinedText(side.joined, !side.groups.empty(), answer.devicesAtLeast);
    if (!joined.empty()) out << "  " << joined << "\n";
    if (buckets || side.whole.histogram.pieces.empty()) continue;
    out << "\n";
    printHistogram(context, side.whole.histogram, answer.devicesAtLeast);
  }
}

Json shownJson(const ShowAnswer& answer) {
  Json sides = Json::array();
  for (const ShowSide& side : answer.sides) {
    const bool isOfVersion = answer.request.againstVersion && &side != &answer.sides.front();
    Json json = {{"title", side.title},
                 {"version", isOfVersion ? Json(*answer.request.againstVersion) : Json(nullptr)},
                 {"shown", side.isShown}};
    if (side.isShown) {
      json["all"] = setJson(side.whole);
      json["groups"] = Json::array();
      for (const ShownSet& group : side.groups)
        json["groups"].push_back(setJson(group));
      json["joined"] = side.joined;
    }
    sides.push_back(std::move(json));
  }
  const catalogue::Entry* entry = catalogue::findStatistic(answer.request.key);
  return {{"key", answer.request.key},
          {"kind", kindText(answer.request.kind)},
          {"unit", entry != nullptr ? entry->unit : ""},
          {"meaning", entry != nullptr ? entry->meaning : ""},
          {"sides", std::move(sides)}};
}

void printShownCsv(std::ostream& out, const std::vector<ShowAnswer>& answers) {
  CsvWriter csv(out);
  for (const char* title :
       {"key", "kind", "side", "part", "group", "devices", "logs", "logs_without_mean", "values",
        "minimum", "maximum", "mean", "squared_deviations", "standard_deviation"}) {
    csv.title(title);
  }
  for (const unsigned percent : kPercents) {
    const std::string name = "p" + std::to_string(percent);
    csv.title(name).title(name + "_above").title(name + "_at_most");
  }
  csv.endRow();
  const auto addSet = [&](const ShownSet& set) {
    const Figures figures = figuresOf(set);
    csv.integer(set.devices).integer(set.logs).integer(figures.logsWithoutMean);
    csv.integer(figures.values);
    if (set.scalar) {
      csv.integer(set.scalar->minimum).integer(set.scalar->maximum);
    } else {
      csv.real(figures.minimum).real(figures.maximum);
    }
    csv.real(figures.mean).real(figures.squaredDeviations);
    figures.deviation ? csv.real(*figures.deviation) : csv.nothing();
    for (std::size_t i = 0; i < kPercents.size(); ++i) {
      if (set.scalar) {
        csv.integer(set.scalar->percentiles[i]).nothing().nothing();
      } else if (i < set.histogram.percentiles.size()) {
        const Interval& interval = set.histogram.percentiles[i];
        csv.nothing().real(interval.lower).real(interval.upper);
      } else {
        csv.nothing().nothing().nothing();
      }
    }
    csv.endRow();
  };
  for (const ShowAnswer& answer : answers) {
    for (const ShowSide& side : answer.sides) {
      forEachSet(side, [&](const ShownSet& set) {
        addNames(csv, answer, side, set);
        addSet(set);
      });
    }
  }
}

void printBucketsCsv(std::ostream& out, const std::vector<ShowAnswer>& answers) {
  CsvWriter csv(out);
  csv.titles({"key", "kind", "side", "part", "group", "above", "at_most", "least", "most"});
  for (const ShowAnswer& answer : answers) {
    for (const ShowSide& side : answer.sides) {
      forEachSet(side, [&](const ShownSet& set) {
        for (const Piece& piece : set.histogram.pieces) {
          addNames(csv, answer, side, set);
          csv.real(piece.lower).real(piece.upper).integer(piece.least).integer(piece.most).endRow();
        }
      });
    }
  }
}

}  // namespace tavrel::fleet
