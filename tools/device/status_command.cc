#include "tools/device/status_command.h"

#include <nlohmann/json.hpp>

#include "base/arithmetic.h"
#include "base/format.h"
#include "base/quantity_text.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/persisted_state.h"
#include "tools/check/check.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"
#include "tools/log/log_conclusion.h"

namespace tavrel {
namespace {

struct DeviceStatus {
  std::optional<SubmissionPermission> permission;  // nothing when preferences cannot be read
  std::int32_t today = 0;
  bool isStateReadable = true;           // the daemon's own preferences
  std::optional<std::int32_t> lastDay;   // of the gated run
  std::optional<std::string> osVersion;  // of the last log
  std::string storePath;
  std::optional<std::int64_t> storeBytes;  // with its write-ahead log; nothing without a store
  Expected<std::optional<SqliteHistory::DaySpan>> days = std::optional<SqliteHistory::DaySpan>();
  Expected<std::size_t> pending = 0;
  Expected<std::size_t> outbox = 0;
  Expected<std::size_t> withheld = 0;
  Expected<std::size_t> refused = 0;
  LogConclusion conclusion;
};

std::optional<std::int64_t> bytesOfStore(const std::string& path) {
  const auto database = FileSystem::status(path);
  if (!database) return std::nullopt;
  const auto log = FileSystem::status(path + "-wal");
  return database->st_size + (log ? log->st_size : 0);
}

DeviceStatus takeStatus(ToolContext& context) {
  LinuxPlatform& device = context.linuxPlatform();
  Platform& platform = device.platform();
  DeviceStatus status;
  const SubmissionPermission permission = submissionPermission(context.preferences());
  if (!context.hasComplaints()) status.permission = permission;
  status.today = platform.statistics->BHDaysSince1970();
  bool hasRun = false;
  const auto lastDay =
      context.preferences().ZTXPreferencesGetIntegerValue(kLastRunDayKey, kTavrelDomain, &hasRun);
  if (hasRun) status.lastDay = lowInt32(lastDay);
  const plist::Value osVersion =
      context.preferences().ZTXPreferencesGetValue(kLastOSVersionKey, kTavrelDomain);
  if (const auto version = osVersion.string()) status.osVersion = *version;
  status.isStateReadable = !context.hasComplaints();
  status.storePath = context.storeForReading().path();
  status.storeBytes = bytesOfStore(status.storePath);
  const auto history = context.storeForReading().openHistory();
  if (!history) {
    status.days = history.error();
  } else if (status.storeBytes) {
    status.days = (*history)->daysHeld();
  }
  status.pending = device.submission().count(FileSubmission::Place::Pending);
  status.outbox = device.submission().count(FileSubmission::Place::Outbox);
  status.withheld = device.submission().count(FileSubmission::Place::Withheld);
  status.refused = device.submission().count(FileSubmission::Place::Refused);
  if (status.isStateReadable) status.conclusion = concludeOnLogs(context);
  return status;
}

Json jsonOfDay(std::optional<std::int32_t> day) {
  if (!day) return nullptr;
  return {{"day", *day}, {"date", dayDateText(*day)}};
}

void printJson(ToolContext& context, const DeviceStatus& status) {
  Json store = {{"path", status.storePath},
                {"bytes", nullptr},
                {"first_day", nullptr},
                {"last_day", nullptr}};
  if (status.storeBytes) store["bytes"] = *status.storeBytes;
  if (status.days && *status.days) {
    store["first_day"] = jsonOfDay((*status.days)->first);
    store["last_day"] = jsonOfDay((*status.days)->last);
  }
  const SubmissionPermission permission = status.permission.value_or(SubmissionPermission());
  const bool isHeldBack = permission.isHeldBack();
  const auto known = [&status](bool fact) {
    return status.permission ? Json(fact) : Json(nullptr);
  };
  context.printJson(
      {{"submission_allowed", known(permission.isGiven && !isHeldBack)},
       {"submission_held_back", known(isHeldBack)},
       {"submission_first_day", jsonOfDay(isHeldBack ? std::nullopt : permission.firstDay)},
       {"today", jsonOfDay(status.today)},
       {"last_reported_day", jsonOfDay(status.lastDay)},
       {"last_os_version", status.osVersion ? Json(*status.osVersion) : Json(nullptr)},
       {"store", std::move(store)},
       {"pending_logs", status.pending ? Json(*status.pending) : Json(nullptr)},
       {"outbox_logs", status.outbox ? Json(*status.outbox) : Json(nullptr)},
       {"withheld_logs", status.withheld ? Json(*status.withheld) : Json(nullptr)},
       {"refused_logs", status.refused ? Json(*status.refused) : Json(nullptr)},
       {"conclusion", status.isStateReadable ? status.conclusion.json() : Json(nullptr)}});
}

std::string storeText(const DeviceStatus& status) {
  if (!status.storeBytes) return status.days ? "none yet" : "unreadable";
  std::string text = sizeText(static_cast<double>(*status.storeBytes));
  if (!status.days) return text + ", unreadable";
  if (!*status.days) return text + ", empty";
  const auto [first, last] = **status.days;
  if (first == last) return text + format(", day %s", dayText(first));
  return text + format(", days %s to %s", dayText(first), dayText(last));
}

Table::Cell submissionCell(const DeviceStatus& status) {
  if (!status.permission) return {"unknown", Emphasis::Alarm};
  if (status.permission->isHeldBack()) return {textOf(*status.permission), Emphasis::Alarm};
  if (status.permission->isGiven) return {textOf(*status.permission)};
  return {"not allowed (allow it with: tavrelctl allow)", Emphasis::Alarm};
}

void printText(ToolContext& context, const DeviceStatus& status) {
  Table table({{""}, {""}});
  const char* const none = status.isStateReadable ? "none yet" : "unknown";
  table.add({"Submission", submissionCell(status)});
  table.add({"Today", dayText(status.today)});
  table.add({"Last day done", status.lastDay ? dayText(*status.lastDay) : none});
  table.add({"Last OS version", status.osVersion.value_or(none)});
  table.add({"Store", storeText(status)});
  table.add({"Store file", status.storePath});
  table.add({"Pending logs", status.pending ? std::to_string(*status.pending) : "unreadable"});
  table.add({"Outbox logs", status.outbox ? std::to_string(*status.outbox) : "unreadable"});
  if (!status.withheld) {
    table.add({"Withheld logs", "unreadable: only root may see them"});
  } else if (*status.withheld > 0) {
    table.add({"Withheld logs", format("%zu, never sent", *status.withheld)});
  }
  if (!status.refused) {
    table.add({"Refused logs", "unreadable"});
  } else if (*status.refused > 0) {
    table.add(
        {"Refused logs", {format("%zu, refused by the server", *status.refused), Emphasis::Alarm}});
  }
  table.add({status.conclusion.isOfNextRun ? "Next run" : "Last daily run",
             status.isStateReadable ? status.conclusion.text() : std::string("unknown")});
  table.print({context.out(), std::nullopt, context.page().isColoured});
}

}  // namespace

void addStatusCommand(Command app, ToolContext& context) {
  const Command command =
      app.addCommand("status", "Show the permission, the last run, the store and the pending logs");
  const auto checks = std::make_shared<bool>(false);
  command.addFlag("--check", *checks,
                  "Check everything: exit status 0 ok, 1 warning, 2 critical, 3 unknown");
  context.addJsonOption(command);
  command.onRun([&context, checks] {
    if (*checks) return showChecks(context);
    const DeviceStatus status = takeStatus(context);
    if (context.json()) {
      printJson(context, status);
    } else {
      printText(context, status);
    }
    if (context.hasComplaints()) context.setExitStatus(kExitFailure);
    if (!status.days) context.fail(status.days.error().message);
    for (const auto* count : {&status.pending, &status.outbox}) {
      if (!*count) return context.fail(count->error().message);
    }
  });
}

}  // namespace tavrel
