#include "tools/consent/permission_commands.h"

#include <algorithm>
#include <limits>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>

#include "base/format.h"
#include "platform/linux/folding/recorded_history.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/linux/segments/segment_reader.h"
#include "platform/linux/store/kept_values.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/persisted_state.h"
#include "platform/platform.h"
#include "tools/consent/fold_everything.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"
#include "tools/log/log_conclusion.h"

namespace tavrel {
namespace {

// The day after it withholds everything.
constexpr std::int32_t kLastFirstDay = SubmissionPermission::kNoDay - 1;

struct AllowArguments {
  std::string from;
};

/// The latest day for which anything is recorded, anywhere; nothing when nothing is.
Expected<std::optional<std::int32_t>> latestRecordedDay(ToolContext& context) {
  // Gives values without a date the day that the clock shows now. A later fold could give them a
  // later day, when the clock is behind now.
  if (const Status folded = foldEverything(context); !folded) return folded.error();
  Platform& platform = context.platform();
  const Recorders recorders = Recorders::read(context.root(), context.linuxPlatform().fileSystem(),
                                              platform.propertyLists, platform.log);
  SqliteStore& store = context.storeForReading();
  const RowSelection everything{.key = {},
                                .firstDay = std::numeric_limits<std::int32_t>::min(),
                                .lastDay = std::numeric_limits<std::int32_t>::max(),
                                .hasValues = false};
  auto history = RecordedHistory::open(context.root(), store, recorders, everything);
  if (!history) return history.error();
  if (const auto warnings = history->warnings(); !warnings.empty()) return Error{warnings.front()};
  const auto days = history->daysHeld();
  if (!days) return days.error();
  std::optional<std::int32_t> latest;
  if (*days) latest = (*days)->last;
  const auto kept = KeptValues(store.path()).read();
  if (!kept) return kept.error();
  if (*kept) {
    for (const KeptValue& value : **kept)
      latest = std::max(latest.value_or(value.day), value.day);
  }
  return latest;
}

/// The day that `--from` names.
Expected<std::int32_t> namedDay(const std::string& text, std::int32_t today) {
  auto day = parseDay(text, today);
  if (!day) return day;
  if (*day < 0) {
    return Error{format("day %s is before 1970: give a number of days since then", dayText(*day))};
  }
  if (*day > kLastFirstDay) {
    return Error{format("day %d never comes: give at most %d", *day, kLastFirstDay)};
  }
  return day;
}

/// The first day of a permission that is given now: a day for which nothing has been recorded yet,
/// even if the clock was or is wrong.
Expected<std::int32_t> firstDayFromNow(ToolContext& context, std::int32_t today) {
  // What is recorded now gets its date only when the clock is set, and would be after any first
  // day.
  if (!currentBootInstant()) {
    return Error{
        format("today is day %s, before this program was built: set the clock first, or "
               "give --from DAY",
               dayText(today))};
  }
  const auto latest = latestRecordedDay(context);
  if (!latest) {
    return Error{format("%s; 'tavrelctl allow --from DAY' does not look at what is recorded",
                        latest.error().message)};
  }
  const std::int32_t last = std::max(latest->value_or(today), today);
  if (last >= kLastFirstDay) {
    return Error{"no day is later than what is recorded: erase that, or give --from DAY"};
  }
  return last + 1;
}

bool store(ToolContext& context, const SubmissionPermission& permission) {
  FilePreferences& preferences = context.preferences();
  setSubmissionPermission(preferences, permission);
  if (!preferences.ZTXPreferencesSynchronize(kDiagnosticsDomain)) return false;
  const auto stored = storedSubmissionPermission(preferences);
  return stored && *stored == permission;
}

void printAllowed(ToolContext& context, const SubmissionPermission& permission, bool isNew) {
  if (context.json()) {
    const auto day = permission.firstDay;
    return context.printJson(
        {{"submission_allowed", true},
         {"submission_first_day",
          day ? Json({{"day", *day}, {"date", dayDateText(*day)}}) : Json(nullptr)},
         {"changed", isNew}});
  }
  context.out() << "submission is " << (isNew ? "" : "already ") << textOf(permission) << '\n';
}

void printAlreadyAllowed(ToolContext& context, const SubmissionPermission& permission,
                         std::int32_t today) {
  printAllowed(context, permission, false);
  if (permission.firstDay && *permission.firstDay - 1 > today && currentBootInstant()) {
    context.note(
        format("today is %s: 'tavrelctl allow --from DAY' names an earlier day", dayText(today)));
  }
}

/// Mentions a first day that covers what is already recorded, or one that a wrong clock has put
/// off.
void noteFirstDay(ToolContext& context, std::int32_t first, bool isNamed, std::int32_t today) {
  if (first <= today) {
    context.note(format("this includes what is already recorded, from day %s on", dayText(first)));
  } else if (!isNamed && first - 1 > today) {
    context.note(
        format("day %s is recorded already, though today is %s: submission begins after "
               "it; give --from DAY if a wrong clock recorded it",
               dayText(first - 1), dayText(today)));
  }
}

/// Mentions what else the first log needs.
void noteMissingWhitelist(ToolContext& context) {
  const WhitelistState whitelist = whitelistState(context);
  if (whitelist.isMissing) context.note("no log is made yet: " + whitelist.fault);
}

/// Whether a permission that is given now would begin no earlier.
bool isEarliest(const SubmissionPermission& stored, std::int32_t today) {
  if (!stored.isGiven || stored.isHeldBack()) return false;
  if (!stored.firstDay || *stored.firstDay - std::int64_t{1} <= today) return true;
  return !currentBootInstant();  // before the clock is set, no first day can be chosen
}

void allow(ToolContext& context, const AllowArguments& arguments) {
  const auto stored = storedSubmissionPermission(context.preferences());
  if (!stored) return context.fail(stored.error().message);
  const std::int32_t today = context.platform().statistics->BHDaysSince1970();
  const bool isNamed = !arguments.from.empty();
  if (!isNamed && isEarliest(*stored, today)) return printAlreadyAllowed(context, *stored, today);
  const auto first = isNamed ? namedDay(arguments.from, today) : firstDayFromNow(context, today);
  if (!first) {
    const std::string& fault = first.error().message;
    return isNamed ? context.failUsage(fault) : context.fail(fault);
  }

  // Waiting logs were permitted; a later first day would partly withdraw that permission.
  if (stored->isGiven && (!stored->firstDay || *first > *stored->firstDay)) {
    if (!isNamed) return printAlreadyAllowed(context, *stored, today);
    return context.fail(format("submission is already %s: a later day needs 'tavrelctl deny' first",
                               textOf(*stored)));
  }
  const SubmissionPermission permission{true, *first};
  if (*stored == permission) return printAlreadyAllowed(context, permission, today);
  if (!stored->isGiven) {
    const RemovedLogs removed = context.linuxPlatform().submission().removeWaiting();
    if (removed.logs > 0) {
      context.note(format("%s of an earlier permission deleted",
                          counted(std::uint64_t{removed.logs}, "waiting log")));
    }
    if (removed.failure) return context.fail(removed.failure->message);
  }
  if (!store(context, permission)) {
    return context.hasComplaints()
               ? context.setExitStatus(kExitFailure)
               : context.fail("the permission was changed at the same moment: run it again");
  }
  printAllowed(context, permission, true);
  noteFirstDay(context, *first, isNamed, today);
  noteMissingWhitelist(context);
}

// The switch goes first: from then on nothing is filed or sent, and should this process be killed,
// the next run deletes the rest. If there is no room to write the switch, deleting makes some.
void deny(ToolContext& context) {
  const SubmissionPermission none{.isGiven = false, .firstDay = {}, .isWithdrawn = true};
  bool isStored = store(context, none);
  const RemovedLogs removed = context.linuxPlatform().submission().removeWaiting();
  isStored = isStored || store(context, none);
  if (context.json()) {
    context.printJson({{"submission_allowed", isStored ? Json(false) : Json(nullptr)},
                       {"deleted_logs", removed.logs}});
  } else {
    context.out() << (isStored ? "submission is not allowed" : "submission may still be allowed")
                  << "; " << counted(std::uint64_t{removed.logs}, "waiting log") << " deleted\n";
  }
  if (!isStored) {
    context.fail("the withdrawal is not stored: solve the problem above, then run it again");
  }
  if (removed.failure) {
    context.fail(format("logs still wait: %s%s", removed.failure->message,
                        isStored ? "; nothing is sent, and the next run deletes them" : ""));
  }
}

}  // namespace

void addAllowCommand(Command app, ToolContext& context) {
  const auto arguments = std::make_shared<AllowArguments>();
  const Command command =
      app.addCommand("allow", "Allow logs to leave the device, from the next whole day on");
  command
      .addOption("--from", arguments->from,
                 "The first day whose statistics may leave: today, yesterday, a day number or "
                 "YYYY-MM-DD, UTC")
      .typeName("DAY");
  command.setFooter(
      "Nothing that was recorded before leaves the device, unless --from names an earlier day. "
      "See\n"
      "tavrelctl(1).");
  context.addJsonOption(command);
  command.onRun([&context, arguments] { allow(context, *arguments); });
}

void addDenyCommand(Command app, ToolContext& context) {
  const Command command =
      app.addCommand("deny", "Withdraw the permission, and delete the logs that wait");
  context.addJsonOption(command);
  command.onRun([&context] { deny(context); });
}

}  // namespace tavrel
