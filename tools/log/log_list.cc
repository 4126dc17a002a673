#include "tools/log/log_list.h"

#include <nlohmann/json.hpp>
#include <ostream>
#include <set>

#include "base/format.h"
#include "base/instant.h"
#include "base/limits.h"
#include "base/quantity_text.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/log_day.h"
#include "platform/plist/coding.h"
#include "platform/tallied_log.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"
#include "tools/log/filed_logs.h"

namespace tavrel {
namespace {

/// What kept the days of logs from being read.
struct Obstacles {
  std::optional<Error> unread;  // the first failure
  std::uint64_t damaged = 0;
  std::string firstDamaged;
};

// Metadata lacks the reported day, so reads the log.
std::optional<std::int32_t> readDay(ToolContext& context, const FiledLog& log,
                                    Obstacles& obstacles) {
  if (!log.metadata.string(kLogMetadataName).value_or(log.name).starts_with(kTalliedLogName)) {
    return std::nullopt;
  }
  const auto bytes =
      context.linuxPlatform().fileSystem().read(log.path, limits::kPropertyListBytes);
  if (!bytes) {
    if (!obstacles.unread && FileSystem::status(log.path)) obstacles.unread = bytes.error();
    return std::nullopt;
  }
  plist::PlistCoding propertyLists;
  const auto day = dayOfLog(*bytes, propertyLists);
  if (!day && !plist::read(asBytes(*bytes)) && obstacles.damaged++ == 0) {
    obstacles.firstDamaged = log.path;
  }
  return day;
}

// Nothing records whether a run was forced, but a gated run always reports the previous day.
bool isSurelyForced(const FiledLog& log, std::optional<std::int32_t> day) {
  const auto filed = log.metadata.date(kLogMetadataTime);
  if (!day || !filed) return false;
  return dayOf(*filed) - 1 != *day;
}

}  // namespace

void listLogs(ToolContext& context, std::size_t most) {
  const auto filed = filedLogs(context, most);
  if (!filed) return context.fail(filed.error().message);
  Table table({{"DAY", Table::Align::Whole},
               {"RUN"},
               {"SIZE", Table::Align::Right},
               {"PLACE"},
               {"FILE", Table::Align::Whole}});
  Json entries = Json::array();
  Obstacles obstacles;
  for (const FiledLog& log : filed->logs) {
    const auto& status = log.status;
    const auto day = readDay(context, log, obstacles);
    const bool isForced = isSurelyForced(log, day);
    if (context.json()) {
      Json entry = jsonOfEnvelope(envelopeOf(log));
      entry["bytes"] = status ? Json(status->st_size) : Json(nullptr);
      entry["day"] = day ? Json(*day) : Json(nullptr);
      entry["date"] = day ? Json(dayDateText(*day)) : Json(nullptr);
      entry["forced"] = isForced ? Json(true) : Json(nullptr);
      entries.push_back(std::move(entry));
    } else {
      table.add({day ? dayDateText(*day) : "-", isForced ? "forced" : "",
                 status ? sizeText(static_cast<double>(status->st_size)) : "?",
                 std::string(nameOf(log.place)), fileNameOf(log)});
    }
  }
  if (context.json()) {
    context.printJson({{"logs", std::move(entries)}, {"older_logs", filed->older}});
  } else if (table.empty()) {
    if (filed->unseen.empty()) context.out() << "no logs\n";
  } else {
    table.print(context.page());
  }
  if (filed->older > 0 && !context.json()) {
    context.out() << counted(filed->older, "older log") << " not shown: see --all\n";
  }
  for (const Unseen& folder : filed->unseen)
    context.fail(folder.message);
  if (!filed->unseen.empty()) return;
  if (obstacles.unread) {
    context.fail(obstacles.unread->message + "; the day of such a log is not shown");
  }
  if (obstacles.damaged > 0) {
    context.fail(format("damaged: %s, the first %s: 'tavrelctl log show FILE' says what is wrong",
                        counted(obstacles.damaged, "log"), obstacles.firstDamaged));
  }
  noteMissingMetadata(context, filed->logs);
}

Expected<LogEnvelope> logNamed(ToolContext& context, const std::string& name) {
  const LogEnvelope file{"file", name, {}};
  if (name == "-" || name.empty()) return file;
  const bool isFile = name.find('/') != std::string::npos || FileSystem::status(name);
  std::vector<Unseen> unseen;
  const auto logs = filedLogsNamed(context, name, unseen);
  if (!logs && !isFile) return logs.error();
  if (!logs || (logs->empty() && isFile)) return file;
  for (const Unseen& folder : unseen)
    context.note(folder.message);
  std::set<std::string_view> names;
  for (const FiledLog& log : *logs)
    names.insert(log.name);
  if (names.size() > 1) {
    return Error{
        format("%s is the beginning of %zu logs: give more of the name: 'tavrelctl log "
               "list' shows them",
               name, names.size())};
  }
  if (!logs->empty()) return envelopeOf(logs->back());
  return Error{format("no log or file %s: 'tavrelctl log list' shows the logs", name)};
}

}  // namespace tavrel
