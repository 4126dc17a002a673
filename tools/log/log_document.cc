#include "tools/log/log_document.h"

#include <nlohmann/json.hpp>
#include <ostream>

#include "base/format.h"
#include "base/iso_date.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/linux/logs/log_day.h"
#include "platform/tallied_log.h"
#include "tools/console/day_argument.h"
#include "tools/console/json_value.h"
#include "tools/console/sorted_entries.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"
#include "tools/log/log_faults.h"
#include "tools/shared/distribution_view.h"
#include "tools/shared/error_figures.h"

namespace tavrel {
namespace {

void printField(const Page& page, std::string_view name, std::string_view text) {
  page.out << format("%-12s  ", name) << printable(text) << '\n';
}

// A value of the header: texts as they are, other values so that they show their type.
std::string fieldText(const plist::Value& value) {
  if (const auto text = value.string()) return std::string(*text);
  return inlineText(value);
}

void printFieldOf(const Page& page, std::string_view name, const plist::Value& value) {
  if (value) printField(page, name, fieldText(value));
}

Json jsonField(const plist::Value& value) {
  if (const auto date = value.date()) return isoDateText(*date);
  return jsonOf(value);
}

void printTitle(const Page& page, std::string_view title, std::size_t count) {
  page.out << '\n' << page.styled(format("%s (%zu)", title, count), Emphasis::Strong) << '\n';
}

// Pairs of keys: the first is the free part of the second.
constexpr std::pair<std::string_view, std::string_view> kDisks[] = {
    {"com.norvane.lumenhall.DiskUsageUserBlocksFree",
     "com.norvane.lumenhall.DiskUsageUserTotalBlocks"},
    {"com.norvane.usage.disk.free_mib", "com.norvane.usage.disk.total_mib"},
};

// A disk whose free share is smaller than this is marked.
constexpr double kShortShare = 0.1;

Emphasis emphasisOf(const plist::Entry& entry, const plist::Dictionary& values) {
  const auto number = entry.value.number();
  if (!number) return Emphasis::None;
  if (isErrorFigure(entry.key) && number->real() != 0) return Emphasis::Alarm;
  for (const auto& [free, total] : kDisks) {
    const auto all = values.number(total);
    if (entry.key == free && all && number->real() < kShortShare * all->real()) {
      return Emphasis::Alarm;
    }
  }
  return Emphasis::None;
}

void printValues(const Page& page, std::string_view title, const plist::Dictionary& values,
                 Table::Align align) {
  if (values.empty()) return;
  printTitle(page, title, values.size());
  Table table({{""}, {"", align}}, 2);
  for (const plist::Entry* entry : sortedEntries(values)) {
    const Emphasis emphasis = emphasisOf(*entry, values);
    table.add({{std::string(entry->key.view()), emphasis}, {fieldText(entry->value), emphasis}});
  }
  table.print(page);
}

void printHistogram(const Page& page, const DistributionView& view) {
  const std::string title = format("Histogram of %s", printable(view.key));
  page.out << '\n' << page.styled(title, Emphasis::Strong) << '\n';
  printBuckets(page, view.buckets);
}

void printDistributions(const Page& page, const std::vector<DistributionView>& views) {
  if (views.empty()) return;
  printTitle(page, "Distributions", views.size());
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
  table.print(page);
  for (const DistributionView& view : views) {
    if (!view.buckets.empty()) printHistogram(page, view);
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

void printEnvelope(const Page& page, const LogEnvelope& envelope) {
  printField(
      page, "Log",
      envelope.path.empty() ? envelope.place : format("%s (%s)", envelope.path, envelope.place));
  const plist::Dictionary& metadata = envelope.metadata;
  printFieldOf(page, "Type", metadata.get(kLogMetadataType));
  printFieldOf(page, "Name", metadata.get(kLogMetadataName));
  printFieldOf(page, "Filed", metadata.get(kLogMetadataTime));
  printFieldOf(page, "OS version", metadata.get(kLogMetadataVersion));
  printFieldOf(page, "Options", metadata.get(kLogMetadataOptions));
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

void printLog(const Page& page, const LogEnvelope& envelope, const plist::Dictionary& document) {
  printEnvelope(page, envelope);
  if (const auto day = dayOfLog(document)) {
    printField(page, "Day", dayText(*day));
  } else {
    printFieldOf(page, "Day", document.get(kStartDateMember));
  }
  printFieldOf(page, "Created", document.get(kCreationDateMember));
  printFieldOf(page, "Version", document.get(kVersionMember));
  printFieldOf(page, "Whitelist", document.get(kWhitelistDigestMember));
  printFieldOf(page, "Tasking", document.get(kTaskIDMember));
  printFieldOf(page, "Task digest", document.get(kTaskDigestMember));
  if (const plist::Array tasking = document.array(kTaskingMember)) {
    printField(page, "Settings", std::to_string(tasking.size()));
  }

  printValues(page, "Metadata", document.dictionary(kMetadataMember), Table::Align::Left);
  printValues(page, "Scalars", document.dictionary(kScalarsMember), Table::Align::Right);
  printDistributions(page, distributionsOf(document));

  if (const auto faults = faultsOf(document); !faults.empty()) {
    printTitle(page, "Format faults", faults.size());
    for (const std::string& fault : faults)
      page.out << "  " << printable(fault) << '\n';
  }

  for (const auto& [title, key] : {std::pair("Tasking settings", kTaskingMember),
                                   std::pair("Activated applications", kApplicationsMember)}) {
    const plist::Array list = document.array(key);
    if (!list) continue;
    if (list.empty() && key == kTaskingMember) continue;
    printTitle(page, title, list.size());
    for (const plist::Value& element : list) {
      page.out << "  " << printable(inlineText(element)) << '\n';
    }
  }
}

Json jsonOfLog(const LogEnvelope& envelope, const plist::Dictionary& document) {
  Json log = jsonOfEnvelope(envelope);
  if (const auto day = dayOfLog(document)) {
    log["day"] = *day;
    log["date"] = dayDateText(*day);
  }
  log["start"] = jsonField(document.get(kStartDateMember));
  log["created"] = jsonField(document.get(kCreationDateMember));
  log["version"] = jsonField(document.get(kVersionMember));
  log["whitelist_digest"] = jsonField(document.get(kWhitelistDigestMember));
  log["task_id"] = jsonField(document.get(kTaskIDMember));
  log["task_digest"] = jsonField(document.get(kTaskDigestMember));
  log["tasking"] = jsonField(document.get(kTaskingMember));
  log["metadata"] = jsonField(document.get(kMetadataMember));
  log["scalars"] = jsonField(document.get(kScalarsMember));
  log["distributions"] = jsonOfDistributions(distributionsOf(document));
  log["faults"] = faultsOf(document);
  if (const auto apps = document.get(kApplicationsMember)) {
    log["activated_applications"] = jsonField(apps);
  }
  return log;
}

}  // namespace tavrel
