#include "tools/log/nandlog_commands.h"

#include <algorithm>
#include <cmath>
#include <nlohmann/json.hpp>
#include <ostream>
#include <utility>
#include <vector>

#include "base/format.h"
#include "base/iso_date.h"
#include "base/limits.h"
#include "base/text.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/preferences/file_preferences.h"
#include "storage/parse/nand_log_writer.h"
#include "tools/console/json_value.h"
#include "tools/console/table.h"
#include "tools/log/filed_logs.h"
#include "tools/log/log_document.h"
#include "tools/shared/error_figures.h"

namespace tavrel {
namespace {

constexpr std::string_view kNandLogType = "165";

using Field = std::pair<std::string, std::string>;

struct NandLog {
  std::vector<Field> header;
  std::string date;
  std::string writer;  // process and identifier
  std::vector<Field> items;
};

struct Group {
  const char* title;
  const char* member;  // in JSON
  bool (*holds)(std::string_view key);
};

// A key belongs to the first group that lists it.
constexpr Group kGroups[] = {
    {"Write amplification", "write_amplification",
     [](std::string_view key) { return key == "UserWamp" || key == "IntermediateWamp"; }},
    {"NAND information", "nand_information",
     [](std::string_view key) { return key.starts_with("com.norvane.NANDInfo."); }},
    {"Valid pages by bucket", "validity",
     [](std::string_view key) { return key.starts_with("ValidityList["); }},
    {"Others", "others", [](std::string_view) { return true; }},
};

bool isInGroup(const Group& group, std::string_view key) {
  return std::find_if(std::begin(kGroups), std::end(kGroups), [key](const Group& candidate) {
           return candidate.holds(key);
         })->title == group.title;
}

/// Removes the text up to `end` from the front and returns it; takes all when there is no `end`.
std::string_view takeUntil(std::string_view& text, std::string_view end) {
  const std::size_t at = std::min(text.find(end), text.size());
  const std::string_view taken = text.substr(0, at);
  text.remove_prefix(std::min(at + end.size(), text.size()));
  return taken;
}

/// A header, a blank line, and "DATE TIME ZONE PROCESS[ID]: KEY:VALUE;...".
/// Nothing for any other text.
std::optional<NandLog> parseNandLog(std::string_view text) {
  NandLog log;
  while (!text.empty()) {
    std::string_view line = takeUntil(text, "\n");
    if (line.empty()) break;
    const std::string_view name = takeUntil(line, ": ");
    log.header.emplace_back(name, line);
  }
  if (text.find("]: ") == std::string_view::npos) return std::nullopt;
  const std::string_view start = text;
  for (int word = 0; word < 3; ++word)
    takeUntil(text, " ");
  log.date = start.substr(0, start.size() - text.size());
  if (!log.date.empty()) log.date.pop_back();
  log.writer = std::string(takeUntil(text, "]: ")) + ']';
  std::string_view body = takeUntil(text, "\n");
  while (!body.empty()) {
    const std::string_view item = takeUntil(body, ";");
    // Values contain no colon, but keys may.
    const std::size_t colon = std::min(item.rfind(':'), item.size());
    log.items.emplace_back(item.substr(0, colon), item.substr(std::min(colon + 1, item.size())));
  }
  return log;
}

/// When the next log may be written.
struct NextLog {
  bool isKnown = true;  // false when preferences cannot be read
  std::optional<plist::Date> last;
  std::optional<plist::Date> from;  // nothing means at the next run
  bool isLastInFuture = false;
};

NextLog nextLog(ToolContext& context) {
  NextLog next;
  next.last = context.preferences()
                  .ZTXPreferencesGetValue(kNandLogLastLoggedKey, kDefaultPreferenceDomain)
                  .date();
  next.isKnown = !context.hasComplaints();
  if (!next.last) return next;
  const double last = next.last->secondsSince1970();
  const double age = context.platform().clock->now().secondsSince1970() - last;
  next.isLastInFuture = age < 0;
  if (age < kNandLogPeriod) next.from = plist::Date::since1970(last + kNandLogPeriod);
  return next;
}

std::string textOf(const NextLog& next) {
  if (!next.isKnown) return "unknown";
  if (!next.last) return "the next run may write one; none has been written yet";
  if (!next.from) {
    return format("the next run may write one; the last was written %s", dateText(*next.last));
  }
  if (!next.isLastInFuture) {
    return format("not before %s; the last was written %s", dateText(*next.from),
                  dateText(*next.last));
  }
  return format(
      "not before %s: the last is dated %s, later than now; 'tavrelctl prefs delete %s %s' lets "
      "the next run write one",
      dateText(*next.from), dateText(*next.last), kDefaultPreferenceDomain, kNandLogLastLoggedKey);
}

Json jsonOf(const NextLog& next) {
  if (!next.isKnown) return nullptr;
  return {{"last_logged", next.last ? Json(isoDateText(*next.last)) : Json(nullptr)},
          {"last_is_in_future", next.isLastInFuture},
          {"allowed_now", !next.from},
          {"allowed_from", next.from ? Json(isoDateText(*next.from)) : Json(nullptr)}};
}

/// A number when the text is one, otherwise the text itself, as for an integer beyond 64 bits.
Json jsonOfNumber(std::string_view text) {
  for (const double special : {HUGE_VAL, -HUGE_VAL, std::nan("")})
    if (text == numberText(special)) return tavrel::jsonOf(plist::Value(special));
  const auto value = parseJsonValue(text);
  return value && value->number() ? tavrel::jsonOf(*value) : Json(text);
}

Json jsonOfItem(const Group& group, std::string_view text) {
  if (std::string_view(group.member) != "validity") return jsonOfNumber(text);
  Json list = Json::array();
  while (!text.empty())
    list.push_back(jsonOfNumber(takeUntil(text, ",")));
  return list;
}

Json jsonOf(const LogEnvelope& envelope, const NandLog& log) {
  Json object = jsonOfEnvelope(envelope);
  Json& header = object["header"] = Json::object();
  for (const auto& [name, value] : log.header)
    header[name] = value;
  object["date"] = log.date;
  object["written_by"] = log.writer;
  for (const Group& group : kGroups) {
    Json& members = object[group.member] = Json::object();
    for (const auto& [key, value] : log.items) {
      if (isInGroup(group, key)) members[key] = jsonOfItem(group, value);
    }
  }
  return object;
}

void printField(std::ostream& out, std::string_view name, std::string_view text) {
  out << format("%-14s  ", name) << printable(text) << '\n';
}

void print(ToolContext& context, const LogEnvelope& envelope, const NandLog& log) {
  const Page page = context.page();
  std::ostream& out = page.out;
  printField(out, "Log", format("%s (%s)", envelope.path, envelope.place));
  for (const auto& [name, value] : log.header)
    printField(out, name, value);
  printField(out, "Written by", log.writer);
  for (const Group& group : kGroups) {
    const bool isList = std::string_view(group.member) == "validity";
    Table table({{""}, {"", isList ? Table::Align::Left : Table::Align::Right}}, 2);
    std::size_t count = 0;
    for (const auto& [key, value] : log.items) {
      if (!isInGroup(group, key)) continue;
      const bool isAlarming = isErrorFigure(key) && value != "0";
      const Emphasis emphasis = isAlarming ? Emphasis::Alarm : Emphasis::None;
      table.add({{key, emphasis}, {value, emphasis}});
      ++count;
    }
    if (count == 0) continue;
    const std::string title = format("%s (%zu)", group.title, count);
    out << '\n' << page.styled(title, Emphasis::Strong) << '\n';
    table.print(page);
  }
  out << '\n';
}

// Without metadata, for example when it is unreadable, the file name decides.
bool isNandLog(const FiledLog& log) {
  if (log.metadata.empty()) return log.name.starts_with(kNandLogName);
  return log.metadata.string(kLogMetadataName) == kNandLogName &&
         log.metadata.string(kLogMetadataType) == kNandLogType;
}

void show(ToolContext& context) {
  std::vector<Unseen> unseen;
  const auto found = newestLog(context, kNandLogName, isNandLog, unseen);
  if (!found) return context.fail(found.error().message);
  for (const Unseen& folder : unseen)
    context.fail(folder.message);
  const std::optional<FiledLog>& newest = *found;
  const NextLog next = nextLog(context);
  Json document = {{"log", nullptr}, {"next", jsonOf(next)}};
  std::string fault;
  if (!newest && !unseen.empty()) {
    // It may be among those.
  } else if (!newest) {
    fault = "no NAND log found: a run writes one when write amplification is high";
  } else {
    const LogEnvelope envelope = envelopeOf(*newest);
    const auto text =
        context.linuxPlatform().fileSystem().read(newest->path, limits::kPropertyListBytes);
    const auto log = text ? parseNandLog(*text) : std::nullopt;
    if (!text) {
      fault = text.error().message;
    } else if (!log) {
      fault = format("not a NAND log: %s: 'tavrelctl log show %s' shows it", newest->path,
                     fileNameOf(*newest));
    } else if (context.json()) {
      document["log"] = jsonOf(envelope, *log);
    } else {
      print(context, envelope, *log);
    }
  }
  if (context.json()) {
    context.printJson(std::move(document));
  } else {
    printField(context.out(), "Next log", textOf(next));
  }
  if (!fault.empty()) context.fail(fault);
  if (context.hasComplaints()) context.setExitStatus(kExitFailure);
}

}  // namespace

void addNandlogCommands(Command app, ToolContext& context) {
  const Command group = app.addGroup("nandlog", "Show the text log of the flash storage's health");
  const Command showCommand =
      group.addCommand("show", "Show the newest NAND log, and when the next one may be written");
  context.addJsonOption(showCommand);
  showCommand.onRun([&context] { show(context); });
}

}  // namespace tavrel
