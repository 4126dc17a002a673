#include "tools/log/log_document.h"

#include <cmath>
#include <nlohmann/json.hpp>
#include <ostream>

#include "base/civil_time.h"
#include "base/format.h"
#include "base/iso_date.h"
#include "base/text.h"
#include "platform/linux/logs/file_submission.h"
#include "tools/log/log_faults.h"
#include "tools/shared/day_argument.h"
#include "tools/shared/distribution_view.h"
#include "tools/shared/json_value.h"
#include "tools/shared/sorted_entries.h"
#include "tools/shared/table.h"
#include "tools/shared/value_text.h"

namespace tavrel {
namespace {

constexpr std::size_t kPlainDigits = 10;

void printField(std::ostream& out, std::string_view name, std::string_view text) {
  out << format("%-12s  ", name) << printable(text) << '\n';
}

// A value of the header: texts plain, everything else as its kind shows.
std::string fieldText(const plist::Value& value) {
  if (const auto text = value.string()) return std::string(*text);
  return inlineText(value);
}

void printFieldOf(std::ostream& out, std::string_view name, const plist::Value& value) {
  if (value) printField(out, name, fieldText(value));
}

Json jsonField(const plist::Value& value) {
  if (const auto date = value.date()) return isoDateText(*date);
  return jsonOf(value);
}

std::optional<std::int32_t> dayOf(const plist::Dictionary& log) {
  const auto start = log.date("BHStartDate");
  if (!start) return std::nullopt;
  const double day = std::floor(start->secondsSince1970() / static_cast<double>(kSecondsPerDay));
  if (!(day >= -2147483648.0 && day <= 2147483647.0)) return std::nullopt;
  return static_cast<std::int32_t>(day);
}

// Long fractions are for programs; people get ten digits.
std::string shortNumber(double value) {
  const std::string exact = numberText(value);
  return exact.size() <= kPlainDigits ? exact : format("%.9g", value);
}

void printValues(std::ostream& out, std::string_view title, const plist::Dictionary& values,
                 Table::Align align, std::optional<std::size_t> columns) {
  if (values.empty()) return;
  out << format("\n%s (%zu)\n", title, values.size());
  Table table({{""}, {"", align}}, 2);
  for (const plist::Entry* entry : sortedEntries(values)) {
    table.add({std::string(entry->key.view()), fieldText(entry->value)});
  }
  table.print(out, columns);
}

void printHistogram(std::ostream& out, const DistributionView& view,
                    std::optional<std::size_t> columns) {
  out << format("\nHistogram of %s\n", printable(view.key));
  printBuckets(out, view.buckets, columns);
}

void printDistributions(std::ostream& out, const std::vector<DistributionView>& views,
                        std::optional<std::size_t> columns) {
  if (views.empty()) return;
  out << format("\nDistributions (%zu)\n", views.size());
  constexpr auto kRight = Table::Align::Right;
  Table table({{"KEY"},
               {"COUNT", kRight},
               {"MINIMUM", kRight},
               {"MAXIMUM", kRight},
               {"MEAN", kRight},
               {"STD DEVIATION", kRight}},
              2);
  for (const DistributionView& view : views) {
    const auto deviation = view.standardDeviation();
    table.add({view.key, std::to_string(view.count), shortNumber(view.minimum),
               shortNumber(view.maximum), shortNumber(view.mean),
               deviation ? shortNumber(*deviation) : "-"});
  }
  table.print(out, columns);
  for (const DistributionView& view : views) {
    if (!view.buckets.empty()) printHistogram(out, view, columns);
  }
}

Json jsonOfDistributions(const std::vector<DistributionView>& views) {
  Json object = Json::object();
  auto& members = object.get_ref<Json::object_t&>();
  for (const DistributionView& view : views) {
    const auto deviation = view.standardDeviation();
    Json summary = {{"count", view.count},
                    {"minimum", jsonOf(view.minimum)},
                    {"maximum", jsonOf(view.maximum)},
                    {"mean", jsonOf(view.mean)},
                    {"sum_of_squared_deviations", jsonOf(view.squaredDeviations)},
                    {"standard_deviation", deviation ? jsonOf(*deviation) : Json(nullptr)}};
    if (!view.buckets.empty()) {
      Json buckets = Json::array();
      for (const auto& bucket : view.buckets) {
        buckets.push_back({{"bucket", bucket.label}, {"count", bucket.count}});
      }
      summary["histogram"] = std::move(buckets);
    }
    members.emplace_back(view.key, std::move(summary));
  }
  return object;
}

}  // namespace

void printEnvelope(std::ostream& out, const LogEnvelope& envelope) {
  printField(
      out, "Log",
      envelope.path.empty() ? envelope.place : format("%s (%s)", envelope.path, envelope.place));
  const plist::Dictionary& metadata = envelope.metadata;
  printFieldOf(out, "Type", metadata.get(kLogMetadataType));
  printFieldOf(out, "Name", metadata.get(kLogMetadataName));
  printFieldOf(out, "Filed", metadata.get(kLogMetadataTime));
  printFieldOf(out, "OS version", metadata.get(kLogMetadataVersion));
  printFieldOf(out, "Options", metadata.get(kLogMetadataOptions));
}

Json jsonOfEnvelope(const LogEnvelope& envelope) {
  const plist::Dictionary& metadata = envelope.metadata;
  Json object = {{"place", envelope.place}};
  if (!envelope.path.empty()) object["path"] = envelope.path;
  const auto add = [&](const char* name, std::string_view key) {
    if (const auto value = metadata.get(key)) object[name] = jsonField(value);
  };
  add("type", kLogMetadataType);
  add("name", kLogMetadataName);
  add("filed", kLogMetadataTime);
  add("os_version", kLogMetadataVersion);
  add("options", kLogMetadataOptions);
  return object;
}

void printLog(std::ostream& out, const LogEnvelope& envelope, const plist::Dictionary& document,
              std::optional<std::size_t> columns) {
  printEnvelope(out, envelope);
  if (const auto day = dayOf(document)) {
    printField(out, "Day", dayText(*day));
  } else {
    printFieldOf(out, "Day", document.get("BHStartDate"));
  }
  printFieldOf(out, "Created", document.get("BHLogCreationDate"));
  printFieldOf(out, "Version", document.get("BHCrashLogVersion"));
  printFieldOf(out, "Whitelist", document.get("BHWhitelistDigest"));
  printFieldOf(out, "Tasking", document.get("BHTaskID"));
  printFieldOf(out, "Task digest", document.get("BHTaskDigest"));
  if (const plist::Array tasking = document.array("BHTasking")) {
    printField(out, "Settings", std::to_string(tasking.size()));
  }

  printValues(out, "Metadata", document.dictionary("BHMetadata"), Table::Align::Left, columns);
  printValues(out, "Scalars", document.dictionary("BHScalars"), Table::Align::Right, columns);
  printDistributions(out, distributionsOf(document), columns);

  if (const auto faults = faultsOf(document); !faults.empty()) {
    out << format("\nNot as a tallied log has it (%zu)\n", faults.size());
    for (const std::string& fault : faults)
      out << "  " << printable(fault) << '\n';
  }

  for (const auto& [title, key] : {std::pair("Tasking settings", "BHTasking"),
                                   std::pair("Activated applications", "BHActivatedAppInfo")}) {
    const plist::Array list = document.array(key);
    if (!list) continue;
    if (list.empty() && key == std::string_view("BHTasking")) continue;
    out << format("\n%s (%zu)\n", title, list.size());
    for (const plist::Value& element : list) {
      out << "  " << printable(inlineText(element)) << '\n';
    }
  }
}

Json jsonOfLog(const LogEnvelope& envelope, const plist::Dictionary& document) {
  Json log = jsonOfEnvelope(envelope);
  if (const auto day = dayOf(document)) {
    log["day"] = *day;
    log["date"] = dayDateText(*day);
  }
  log["start"] = jsonField(document.get("BHStartDate"));
  log["created"] = jsonField(document.get("BHLogCreationDate"));
  log["version"] = jsonField(document.get("BHCrashLogVersion"));
  log["whitelist_digest"] = jsonField(document.get("BHWhitelistDigest"));
  log["task_id"] = jsonField(document.get("BHTaskID"));
  log["task_digest"] = jsonField(document.get("BHTaskDigest"));
  log["tasking"] = jsonField(document.get("BHTasking"));
  log["metadata"] = jsonField(document.get("BHMetadata"));
  log["scalars"] = jsonField(document.get("BHScalars"));
  log["distributions"] = jsonOfDistributions(distributionsOf(document));
  log["faults"] = faultsOf(document);
  if (const auto apps = document.get("BHActivatedAppInfo")) {
    log["activated_applications"] = jsonField(apps);
  }
  return log;
}

}  // namespace tavrel
