#include "tools/device/tasking_commands.h"

#include <cstddef>
#include <cstdint>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string>
#include <string_view>
#include <vector>

#include "base/arithmetic.h"
#include "daemon/tasking.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/persisted_state.h"
#include "platform/platform.h"
#include "tools/console/day_argument.h"
#include "tools/console/json_value.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"
#include "tools/device/tasking_document.h"
#include "tools/shared/input_file.h"

namespace tavrel {
namespace {

/// A longer list of findings says nothing new about a document.
constexpr std::size_t kFindingsShown = 20;

/// A tasking as stored in preferences. Others write these too, so any value may have any type.
struct Tasking {
  plist::Value identifier;
  plist::Value system;  // only for an applied one
  plist::Value digest;
  plist::Value payload;
};

struct Taskings {
  explicit Taskings(ToolContext& context)
      : document(
            context.preferences().ZTXPreferencesGetValue(kScheduledTaskingKey, kScheduleDomain)) {
    const plist::Dictionary dictionary = document.dictionary();
    scheduled = {dictionary.get(kTaskingIDKey),
                 {},
                 dictionary.get(kTaskingDigestKey),
                 dictionary.get(kTaskingPayloadKey)};
    const auto get = [&](std::string_view key) {
      return context.preferences().ZTXPreferencesGetValue(key, kTavrelDomain);
    };
    applied = {get(kTaskingIDKey), get(kTaskingOSKey), get(kTaskingDigestKey),
               get(kTaskingPayloadKey)};
    lastUpdate = get(kLastOSUpdateKey).dictionary();
    change = nextTaskingChange(context.platform());
  }

  /// What the next daily run will do.
  std::string_view nextRun() const {
    switch (change) {
      case TaskingChange::None:
        return "changes nothing";
      case TaskingChange::Apply:
        return "applies the scheduled tasking";
      case TaskingChange::Replace:
        return "undoes the applied tasking and applies the scheduled one";
      case TaskingChange::Refuse:
        return "refuses the scheduled tasking, which preferences cannot store";
    }
    return "";
  }

  plist::Value document;
  Tasking scheduled;
  Tasking applied;
  plist::Dictionary lastUpdate;
  TaskingChange change = TaskingChange::None;
};

std::string text(const plist::Value& value) {
  if (!value) return "-";
  return value.string() ? std::string(*value.string()) : inlineText(value);
}

std::string dayOrText(const plist::Value& value) {
  const auto number = value.number();
  const bool isDay =
      number && !number->isFloating() && std::in_range<std::int32_t>(number->int64());
  return isDay ? dayText(lowInt32(number->int64())) : text(value);
}

Json json(const Tasking& tasking) {
  if (!tasking.identifier && !tasking.payload) return nullptr;
  Json object = {{kTaskingIDKey, jsonOf(tasking.identifier)}};
  if (tasking.system) object[kTaskingOSKey] = jsonOf(tasking.system);
  object[kTaskingDigestKey] = jsonOf(tasking.digest);
  object[kTaskingPayloadKey] = jsonOf(tasking.payload);
  return object;
}

void print(ToolContext& context, std::string_view title, const Tasking& tasking) {
  std::ostream& out = context.out();
  out << title << ": ";
  if (!tasking.identifier && !tasking.payload) {
    out << "none\n";
    return;
  }
  out << printable(text(tasking.identifier)) << '\n';
  if (tasking.system) out << "  OS build: " << printable(text(tasking.system)) << '\n';
  out << "  digest: " << printable(text(tasking.digest)) << '\n';
  const plist::Array settings = tasking.payload.array();
  out << "  settings: " << (settings ? std::to_string(settings.size()) : "none") << '\n';
  Table table({{"DOMAIN"}, {"KEY"}, {"VALUE"}}, 4);
  for (const plist::Value& setting : settings) {
    const plist::Dictionary dictionary = setting.dictionary();
    table.add({text(dictionary.get(kSettingDomain)), text(dictionary.get(kSettingKey)),
               inlineText(dictionary.get(kSettingValue))});
  }
  if (!table.empty()) table.print(context.page());
}

void show(ToolContext& context) {
  const Taskings taskings(context);
  // Unreadable preferences must not look like absent ones.
  if (context.hasComplaints()) return context.setExitStatus(kExitFailure);
  if (context.json()) {
    const Json lastUpdate = taskings.lastUpdate ? jsonOf(taskings.lastUpdate) : Json(nullptr);
    context.printJson({{"scheduled", json(taskings.scheduled)},
                       {"applied", json(taskings.applied)},
                       {kLastOSUpdateKey, lastUpdate},
                       {"next_run", taskings.nextRun()}});
    return;
  }
  print(context, "Scheduled tasking", taskings.scheduled);
  print(context, "Applied tasking", taskings.applied);
  context.out() << "Last OS update: ";
  if (taskings.lastUpdate) {
    context.out() << printable(text(taskings.lastUpdate.get("version"))) << ", first seen on day "
                  << printable(dayOrText(taskings.lastUpdate.get("day"))) << '\n';
  } else {
    context.out() << "none seen\n";
  }
  context.out() << "The next daily run " << taskings.nextRun() << ".\n";
}

bool store(ToolContext& context, const plist::Value& tasking) {
  Preferences& preferences = context.preferences();
  preferences.ZTXPreferencesSetValue(kScheduledTaskingKey, tasking, kScheduleDomain);
  // A value that is too large for preferences is dropped, and the rest is written.
  if (preferences.ZTXPreferencesSynchronize(kScheduleDomain) &&
      preferences.ZTXPreferencesGetValue(kScheduledTaskingKey, kScheduleDomain) == tasking) {
    return true;
  }
  context.setExitStatus(kExitFailure);  // a note has said why
  return false;
}

void schedule(ToolContext& context, const std::string& path) {
  const auto tasking = readDocument(context, path);
  if (!tasking) return context.fail(tasking.error().message);

  const std::string name = path == "-" ? "standard input" : path;
  const std::vector<std::string> findings = checkTasking(*tasking);
  for (std::size_t i = 0; i < findings.size() && i < kFindingsShown; ++i) {
    context.fail(name + ": " + findings[i]);
  }
  if (findings.size() > kFindingsShown) {
    context.note(name + ": " + std::to_string(findings.size() - kFindingsShown) +
                 " more findings of this kind");
  }
  if (!findings.empty() || !store(context, *tasking)) return;

  const plist::Dictionary dictionary = tasking->dictionary();
  context.out() << "Scheduled tasking " << printable(text(dictionary.get(kTaskingIDKey)))
                << " with " << counted(dictionary.array(kTaskingPayloadKey).size(), "setting")
                << ". The next daily run " << Taskings(context).nextRun() << ".\n";
}

void clear(ToolContext& context) {
  const Taskings taskings(context);
  if (!taskings.document && context.hasComplaints()) return context.setExitStatus(kExitFailure);
  if (!taskings.document) {
    context.out() << "No tasking is scheduled.\n";
    return;
  }
  if (!store(context, {})) return;
  context.out() << "Removed scheduled tasking " << printable(text(taskings.scheduled.identifier))
                << ". Settings already applied stay; aggressive submission ends.\n";
}

}  // namespace

void addTaskingCommands(Command app, ToolContext& context) {
  const Command group =
      app.addGroup("tasking", "Show and schedule preference settings for the device");

  const Command showCommand =
      group.addCommand("show", "Show the scheduled and the applied tasking");
  context.addJsonOption(showCommand);
  showCommand.onRun([&context] { show(context); });

  const Command scheduleCommand =
      group.addCommand("schedule", "Check a tasking, a property list or JSON, and schedule it");
  auto path = std::make_shared<std::string>();
  scheduleCommand.addOption("FILE", *path, "The tasking; - for standard input")
      .required()
      .notEmpty();
  scheduleCommand.onRun([&context, path] { schedule(context, *path); });

  const Command clearCommand = group.addCommand("clear", "Remove the scheduled tasking");
  clearCommand.onRun([&context] { clear(context); });
}

}  // namespace tavrel
