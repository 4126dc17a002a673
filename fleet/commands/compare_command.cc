#include "fleet/commands/compare_command.h"

#include <algorithm>
#include <cmath>
#include <nlohmann/json.hpp>
#include <ostream>

#include "catalogue/catalogue.h"
#include "fleet/commands/csv_writer.h"
#include "fleet/commands/question.h"
#include "fleet/questions/compare.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"

namespace tavrel::fleet {
namespace {

struct CompareOptions : QuestionOptions {
  std::string before;
  std::string after;
  bool all = false;
};

std::string signedText(double value) {
  return (value > 0 ? "+" : "") + shortNumber(value);
}

/// Never -0.
double rounded(double value, double digits) {
  return std::round(value * digits) / digits + 0.0;
}

std::string percentOf(std::optional<double> share) {
  if (!share || !std::isfinite(*share)) return "";
  return signedText(rounded(*share, 1000) * 100) + " %";
}

/// Probabilities are rounded to two digits.
std::string pValueText(double value) {
  if (value < 1e-300) return "0";
  const double digits = std::pow(10, 1 - std::floor(std::log10(value)));
  return shortNumber(rounded(value, digits));
}

std::string leftOutText(const CompareAnswer& answer) {
  std::string text;
  const auto add = [&](std::size_t count, const std::string& why) {
    if (count != 0) text += "  " + counted(count, "statistic") + " " + why + "\n";
  };
  add(answer.leftOut, "without logs of at least " + std::to_string(answer.devicesAtLeast) +
                          " devices in both versions, or too close to a set that was shown");
  add(answer.unfit, "whose mean or deviation a double cannot hold in one version");
  return text.empty() ? text : "Left out:\n" + text;
}

void printText(FleetContext& context, const CompareAnswer& answer, bool all) {
  std::size_t changed = 0;
  const auto withoutMean = [](const Comparison& one) {
    return one.before.logsWithoutMean + one.after.logsWithoutMean;
  };
  const bool areLeftOut = std::ranges::any_of(answer.comparisons, [&](const Comparison& one) {
    return (one.isSignificant() || all) && withoutMean(one) != 0;
  });
  using Align = Table::Align;
  std::vector<Table::Column> columns = {{"KEY", Align::Whole},
                                        {"KIND", Align::Whole},
                                        {"BEFORE", Align::Right, 1},
                                        {"AFTER", Align::Right},
                                        {"CHANGE", Align::Right, 5},
                                        {"RELATIVE", Align::Right},
                                        {"95 % INTERVAL", Align::Whole, 6},
                                        {"UNIT", Align::Whole, 4},
                                        {"EFFECT", Align::Right, 3},
                                        {"CHANCE", Align::Right, 2}};
  if (areLeftOut) columns.push_back({"NO MEAN", Align::Right});
  Table table(std::move(columns));
  for (const Comparison& one : answer.comparisons) {
    if (one.isSignificant()) ++changed;
    if (!one.isSignificant() && !all) continue;
    table.add(
        {{one.key.name, one.isSignificant() ? Emphasis::Strong : Emphasis::None},
         kindText(one.key.kind),
         shortNumber(one.before.mean),
         shortNumber(one.after.mean),
         signedText(one.difference),
         percentOf(one.relative),
         signedText(one.difference - one.margin) + " to " + signedText(one.difference + one.margin),
         std::string(catalogue::unitOf(one.key.name)),
         one.effect ? signedText(rounded(*one.effect, 100)) : "constant",
         pValueText(one.adjustedPValue),
         withoutMean(one) == 0 ? "" : std::to_string(withoutMean(one))});
  }
  std::ostream& out = context.out();
  out << printable(answer.request.oldVersion) << " -> " << printable(answer.request.newVersion)
      << ", " << textOf(answer.request.days) << ": " << changed << " of "
      << counted(answer.comparisons.size(), "statistic") << " changed\n";
  if (!table.empty()) {
    out << "\n";
    table.print(context.page());
  }
  if (areLeftOut) out << "\n" << noMeanText() << "\n";
  const std::string leftOut = leftOutText(answer);
  if (!leftOut.empty()) out << "\n" << leftOut;
}

Json sideJson(const ComparedSide& side) {
  return {{"devices", side.devices},
          {"logs", side.logs},
          {"logs_without_mean", side.logsWithoutMean},
          {"mean", realJson(side.mean)},
          {"standard_deviation", side.deviation ? realJson(*side.deviation) : Json(nullptr)}};
}

Json compareJson(const CompareAnswer& answer) {
  Json list = Json::array();
  for (const Comparison& one : answer.comparisons) {
    list.push_back({{"key", one.key.name},
                    {"kind", kindText(one.key.kind)},
                    {"unit", catalogue::unitOf(one.key.name)},
                    {"changed", one.isSignificant()},
                    {"before", sideJson(one.before)},
                    {"after", sideJson(one.after)},
                    {"difference", realJson(one.difference)},
                    {"lower", realJson(one.difference - one.margin)},
                    {"upper", realJson(one.difference + one.margin)},
                    {"relative", one.relative ? realJson(*one.relative) : Json(nullptr)},
                    {"effect", one.effect ? realJson(*one.effect) : Json(nullptr)},
                    {"probability", one.pValue},
                    {"corrected_probability", one.adjustedPValue}});
  }
  return {{"old_version", answer.request.oldVersion},
          {"new_version", answer.request.newVersion},
          {"days", daysJson(answer.request.days)},
          {"devices_at_least", answer.devicesAtLeast},
          {"confidence", kConfidenceLevel},
          {"comparisons", std::move(list)},
          {"left_out", {{"not_in_both", answer.leftOut}, {"no_mean", answer.unfit}}}};
}

void printCsv(std::ostream& out, const CompareAnswer& answer) {
  CsvWriter csv(out);
  csv.titles({"key",
              "kind",
              "unit",
              "changed",
              "devices_before",
              "devices_after",
              "logs_before",
              "logs_after",
              "logs_without_mean_before",
              "logs_without_mean_after",
              "mean_before",
              "mean_after",
              "standard_deviation_before",
              "standard_deviation_after",
              "difference",
              "lower",
              "upper",
              "relative",
              "effect",
              "probability",
              "corrected_probability"});
  const auto optional = [&](std::optional<double> value) {
    value ? csv.real(*value) : csv.nothing();
  };
  for (const Comparison& one : answer.comparisons) {
    csv.text(one.key.name).title(kindText(one.key.kind)).title(catalogue::unitOf(one.key.name));
    csv.title(one.isSignificant() ? "true" : "false");
    csv.integer(one.before.devices).integer(one.after.devices);
    csv.integer(one.before.logs).integer(one.after.logs);
    csv.integer(one.before.logsWithoutMean).integer(one.after.logsWithoutMean);
    csv.real(one.before.mean).real(one.after.mean);
    optional(one.before.deviation);
    optional(one.after.deviation);
    csv.real(one.difference).real(one.difference - one.margin).real(one.difference + one.margin);
    optional(one.relative);
    optional(one.effect);
    csv.real(one.pValue).real(one.adjustedPValue).endRow();
  }
}

}  // namespace

void addCompareCommand(Command top, FleetContext& context) {
  const Command command =
      top.addCommand("compare", "Find the statistics that changed between two OS versions");
  auto options = std::make_shared<CompareOptions>();
  command.addOption("OLD", options->before, "The earlier version, or a part of its name")
      .typeName("")
      .required()
      .notEmpty();
  command.addOption("NEW", options->after, "The later version").typeName("").required().notEmpty();
  addQuestionOptions(command, *options);
  addFormOptions(command, context, *options);
  command.addFlag("--all", options->all, "Also list the statistics that did not change");
  command.onRun([&context, options] {
    ask(context, *options, [&](Question& question) {
      const CompareRequest request{question.readVersion(options->before),
                                   question.readVersion(options->after), question.days()};
      if (request.oldVersion == request.newVersion) {
        throw UsageError("OLD and NEW are the same version: name two");
      }
      const CompareAnswer answer = compare(question.engine(), question.ledger(), request);
      if (context.json()) return context.printJson(compareJson(answer));
      if (options->csv) return printCsv(context.out(), answer);
      printText(context, answer, options->all);
    });
  });
}

}  // namespace tavrel::fleet
