#include "fleet/commands/show_output.h"

#include <algorithm>
#include <cmath>
#include <nlohmann/json.hpp>
#include <ostream>

#include "catalogue/catalogue.h"
#include "fleet/commands/csv_writer.h"
#include "fleet/commands/question.h"
#include "fleet/questions/merged_numbers.h"
#include "tools/shared/table.h"
#include "tools/shared/value_text.h"

namespace tavrel::fleet {

namespace {

/// What both kinds of statistics have.
struct Figures {
  std::uint64_t values = 0;
  double minimum = 0;
  double maximum = 0;
  double mean = 0;
  double squaredDeviations = 0;
};

Figures figuresOf(const ShownSet& set) {
  if (set.scalar) {
    return {set.logs, static_cast<double>(set.scalar->minimum),
            static_cast<double>(set.scalar->maximum), set.scalar->mean,
            set.scalar->squaredDeviations};
  }
  const FiveNumbers numbers = set.merged.value_or(FiveNumbers{});
  return {numbers.count, numbers.minimum, numbers.maximum, numbers.mean, numbers.squaredDeviations};
}

std::optional<double> deviationOf(const Figures& figures) {
  return standardDeviation({0, 0, 0, figures.squaredDeviations, figures.values});
}

std::string intervalText(const Interval& interval) {
  if (std::isinf(interval.lower) && std::isinf(interval.upper)) return "?";
  if (std::isinf(interval.lower)) return "≤ " + shortNumber(interval.upper);
  if (std::isinf(interval.upper)) return "> " + shortNumber(interval.lower);
  return shortNumber(interval.lower) + " to " + shortNumber(interval.upper);
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
  use(side.whole, true);
  for (const ShownSet& group : side.groups)
    use(group, false);
}

void printFigures(FleetContext& context, const ShowSide& side) {
  using Align = Table::Align;
  std::vector<Table::Column> columns = {{""},
                                        {"DEVICES", Align::Right},
                                        {"LOGS", Align::Right},
                                        {"VALUES", Align::Right},
                                        {"MINIMUM", Align::Right},
                                        {"MEAN", Align::Right},
                                        {"MAXIMUM", Align::Right},
                                        {"STD DEVIATION", Align::Right}};
  for (const unsigned percent : kPercents) {
    columns.push_back({std::to_string(percent) + " %", Align::Right});
  }
  Table table(std::move(columns), 2);
  forEachSet(side, [&](const ShownSet& set, bool) {
    const Figures figures = figuresOf(set);
    const std::optional<double> deviation = deviationOf(figures);
    std::vector<Table::Cell> cells = {set.title,
                                      std::to_string(set.devices),
                                      std::to_string(set.logs),
                                      std::to_string(figures.values),
                                      shortNumber(figures.minimum),
                                      shortNumber(figures.mean),
                                      shortNumber(figures.maximum),
                                      deviation ? shortNumber(*deviation) : ""};
    for (std::size_t i = 0; i < kPercents.size(); ++i)
      cells.push_back(percentileText(set, i));
    table.add(std::move(cells));
  });
  table.print(context.page());
}

void printHistogram(FleetContext& context, const HistogramAnswer& histogram) {
  if (histogram.pieces.empty()) return;
  std::uint64_t largest = 1;
  for (const Piece& piece : histogram.pieces)
    largest = std::max(largest, piece.most);
  context.out() << "\n";
  Table table({{""}, {"", Table::Align::Right}, {"", Table::Align::Bar}}, 2);
  for (const Piece& piece : histogram.pieces) {
    const std::string count = piece.least == piece.most ? std::to_string(piece.least)
                                                        : std::to_string(piece.least) + " to " +
                                                              std::to_string(piece.most);
    table.add({bucketText(piece.lower, piece.upper), count,
               Table::Cell::bar(static_cast<double>(piece.least), static_cast<double>(largest))});
  }
  table.print(context.page());
}

Json setJson(const ShownSet& set) {
  const Figures figures = figuresOf(set);
  const std::optional<double> deviation = deviationOf(figures);
  Json json = {{"title", set.title},
               {"devices", set.devices},
               {"logs", set.logs},
               {"values", figures.values}};
  if (set.scalar) {
    json["minimum"] = set.scalar->minimum;
    json["maximum"] = set.scalar->maximum;
  } else {
    json["minimum"] = realJson(figures.minimum);
    json["maximum"] = realJson(figures.maximum);
  }
  json["mean"] = realJson(figures.mean);
  json["squared_deviations"] = realJson(figures.squaredDeviations);
  json["standard_deviation"] = deviation ? realJson(*deviation) : Json(nullptr);
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

}  // namespace

std::string bucketText(double lower, double upper) {
  return "(" + (std::isinf(lower) ? "-inf" : shortNumber(lower)) + ", " +
         (std::isinf(upper) ? "inf)" : shortNumber(upper) + "]");
}

const char* kindText(const ShowAnswer& answer) {
  return answer.request.kind == KeyKind::kScalar ? "scalar" : "distribution";
}

void printShown(FleetContext& context, const ShowAnswer& answer) {
  std::ostream& out = context.out();
  const std::string& key = answer.request.key;
  out << printable(key) << ": " << kindText(answer);
  if (const catalogue::Entry* entry = catalogue::findStatistic(key)) {
    if (!entry->unit.empty()) out << ", in " << entry->unit;
    if (!entry->meaning.empty()) out << "\n" << entry->meaning;
  }
  out << "\n";
  for (const ShowSide& side : answer.sides) {
    out << "\n" << context.page().styled(printable(side.title), Emphasis::Strong) << "\n";
    if (!side.isShown) {
      out << "  " << tooFewText(answer.devicesAtLeast) << "\n";
      continue;
    }
    printFigures(context, side);
    const std::string joined = joinedText(side.joined, !side.groups.empty(), answer.devicesAtLeast);
    if (!joined.empty()) out << "  " << joined << "\n";
    printHistogram(context, side.whole.histogram);
  }
}

Json shownJson(const ShowAnswer& answer) {
  Json sides = Json::array();
  for (const ShowSide& side : answer.sides) {
    Json json = {{"title", side.title}, {"shown", side.isShown}};
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
          {"kind", kindText(answer)},
          {"unit", entry != nullptr ? entry->unit : ""},
          {"meaning", entry != nullptr ? entry->meaning : ""},
          {"sides", std::move(sides)}};
}

void printShownCsv(std::ostream& out, const std::vector<ShowAnswer>& answers) {
  CsvWriter csv(out);
  for (const char* title : {"key", "kind", "side", "group", "devices", "logs", "values", "minimum",
                            "maximum", "mean", "squared_deviations"}) {
    csv.title(title);
  }
  for (const unsigned percent : kPercents) {
    const std::string name = "p" + std::to_string(percent);
    csv.title(name + "_above").title(name + "_at_most");
  }
  csv.endRow();
  for (const ShowAnswer& answer : answers) {
    for (const ShowSide& side : answer.sides) {
      forEachSet(side, [&](const ShownSet& set, bool isWhole) {
        const Figures figures = figuresOf(set);
        csv.text(answer.request.key).title(kindText(answer)).text(side.title);
        csv.text(isWhole ? "" : set.title);
        csv.integer(set.devices).integer(set.logs).integer(figures.values);
        if (set.scalar) {
          csv.integer(set.scalar->minimum).integer(set.scalar->maximum);
        } else {
          csv.real(figures.minimum).real(figures.maximum);
        }
        csv.real(figures.mean).real(figures.squaredDeviations);
        for (std::size_t i = 0; i < kPercents.size(); ++i) {
          if (set.scalar) {
            csv.integer(set.scalar->percentiles[i]).integer(set.scalar->percentiles[i]);
          } else if (i < set.histogram.percentiles.size()) {
            csv.real(set.histogram.percentiles[i].lower).real(set.histogram.percentiles[i].upper);
          } else {
            csv.nothing().nothing();
          }
        }
        csv.endRow();
      });
    }
  }
}

}  // namespace tavrel::fleet
