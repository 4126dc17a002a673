// Permission, clock, and the last run with its log.
#include "base/arithmetic.h"
#include "base/format.h"
#include "base/instant.h"
#include "base/quantity_text.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/linux/runs/last_run.h"
#include "platform/persisted_state.h"
#include "tools/check/checks.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"
#include "tools/log/log_conclusion.h"

namespace tavrel {
namespace {

constexpr CheckFigureKind kAllowed{"allowed", "tavrel_submission_allowed", "",
                                   "Whether the daily log may leave the device: 1 or 0."};
constexpr CheckFigureKind kRunTime{"finished_timestamp_seconds",
                                   "tavrel_last_run_finished_timestamp_seconds", "seconds",
                                   "When a run last finished the tasks of a day."};
constexpr CheckFigureKind kRunErrors{"errors", "tavrel_last_run_errors", "",
                                     "Errors that the last run logged."};

// A run takes seconds; one that takes longer than this is stuck.
constexpr std::int64_t kLongRun = 3600;

Check lastRunCheck(CheckScene& scene, const LastRun& run) {
  Check check{"last-run"};
  if (run.lastFinished) {
    check.state = stateOfAge(scene.ageOf(*run.lastFinished));
    check.figures.push_back({&kRunTime, static_cast<double>(wholeSeconds(*run.lastFinished))});
  }
  check.figures.push_back({&kRunErrors, static_cast<double>(run.errorCount)});
  const std::string age = ageText(scene.ageOf(run.began));
  // A run of today's tasks counts as forced, too; only the day tells the two apart.
  std::string what = !run.kind                      ? "a run"
                     : run.kind == RunKind::Service ? "the service's run"
                     : run.kind == RunKind::Daily   ? "the daily run"
                                                    : "the forced run";
  what += run.day ? " of day " + dayText(lowInt32(*run.day)) : ", which began no day's tasks,";
  if (run.isFinished) {
    check.text = format("%s finished, begun %s ago", what, age);
  } else if (run.process.isRunning()) {
    check.text = format("%s has been running for %s", what, age);
    if (scene.ageOf(run.began) >= kLongRun) check.state = graver(check.state, CheckState::Warning);
  } else {
    check.text = format("%s, begun %s ago, was killed before its end", what, age);
    check.state = graver(check.state, CheckState::Warning);
  }
  if (run.lastFinished && (!run.isFinished || !run.day)) {
    check.text += format("; the last one to finish a day ended %s ago",
                         ageText(scene.ageOf(*run.lastFinished)));
  }
  if (run.errorCount > 0) {
    check.state = graver(check.state, CheckState::Warning);
    check.text += format("; %s", counted(static_cast<std::uint64_t>(run.errorCount), "error"));
    for (const std::string& error : run.errors)
      check.text += (&error == run.errors.data() ? ": " : "; ") + error;
  }
  return check;
}

CheckState stateOf(LogOutcome outcome) {
  switch (outcome) {
    case LogOutcome::Filed:
    case LogOutcome::NotPermitted:  // the owner's decision, which the permission check shows
      return CheckState::Ok;
    case LogOutcome::PermissionUnknown:
      return CheckState::Unknown;
    case LogOutcome::FiledInPart:
    case LogOutcome::NoWhitelist:
    case LogOutcome::NothingToReport:
      return CheckState::Warning;
    case LogOutcome::StoreUnreadable:
    case LogOutcome::NotFiled:
      break;
  }
  return CheckState::Critical;
}

void addLostPermission(Check& check, FilePreferences& preferences) {
  const auto isDamaged = preferences.hasDamagedFile(kDiagnosticsDomain);
  if (!isDamaged) return addFinding(check, CheckState::Unknown, isDamaged.error().message);
  if (!*isDamaged) return;
  addFinding(check, CheckState::Warning,
             format("a permission may have been lost, because the preferences of %s were damaged "
                    "and set aside: ask the owner, then run 'tavrelctl allow' or 'tavrelctl deny'",
                    kDiagnosticsDomain));
}

}  // namespace

void checkPermission(CheckScene& scene) {
  Check check{"permission"};
  FilePreferences& preferences = scene.context.preferences();
  const plist::Value value =
      preferences.ZTXPreferencesGetValue(kSubmissionEnabledKey, kDiagnosticsDomain);
  const SubmissionPermission permission = submissionPermission(preferences);
  const bool isAllowed = permission.isGiven && !permission.isHeldBack();
  const auto day = permission.firstDay;
  if (scene.context.hasComplaints()) {
    check.state = CheckState::Unknown;
    check.text = "preferences cannot be read";
  } else {
    check.figures.push_back({&kAllowed, isAllowed ? 1.0 : 0.0});
    check.text =
        isAllowed ? "the daily log may leave the device" : "the daily log may not leave the device";
    if (!value.isNull() && !value.boolean()) {
      check.state = CheckState::Warning;
      check.text = format("%s is %s, which counts as no: set it as a boolean",
                          kSubmissionEnabledKey, kindWithArticle(value));
    } else if (permission.isHeldBack()) {
      check.state = CheckState::Warning;
      check.text = textOf(permission);
    } else if (value.isNull()) {
      addLostPermission(check, preferences);
    } else if (isAllowed && day && *day >= scene.today) {
      check.text += format(", from day %s on", dayText(*day));
      if (*day - 1 > scene.today) {
        check.state = CheckState::Warning;
        check.text += ": 'tavrelctl allow --from DAY' names an earlier day";
      }
    }
  }
  scene.checks.push_back(std::move(check));
}

void checkClock(CheckScene& scene) {
  Check check{"clock"};
  bool hasRun = false;
  const std::int32_t lastDay = lowInt32(scene.context.preferences().ZTXPreferencesGetIntegerValue(
      kLastRunDayKey, kTavrelDomain, &hasRun));
  check.text = format("today is day %s", dayText(scene.today));
  if (scene.today < TAVREL_BUILD_DAY) {
    check.state = CheckState::Critical;
    check.text += ", before this program was built: set the clock";
  } else if (hasRun && std::int64_t{lastDay} > std::int64_t{scene.today} + 1) {
    check.state = CheckState::Critical;
    check.text += format(
        ", and day %s counts as reported: no run comes before then. A tasking or a clock that was "
        "ahead set it: see which, then 'tavrelctl prefs delete %s %s'",
        dayText(lastDay), kTavrelDomain, kLastRunDayKey);
  } else if (hasRun && lastDay >= scene.today) {
    check.state = CheckState::Warning;
    check.text += format(
        ", and day %s was already reported: the clock was set back, and no run comes before then",
        dayText(lastDay));
  }
  scene.checks.push_back(std::move(check));
}

void checkLastRun(CheckScene& scene) {
  const auto run = LastRun::read(scene.context.root(), scene.context.linuxPlatform().fileSystem());
  if (run && *run) return scene.checks.push_back(lastRunCheck(scene, **run));
  scene.checks.push_back(
      {"last-run", "", CheckState::Unknown,
       run ? "no run yet: tavrel-daily.timer starts one each day" : run.error().message});
}

void checkLastLog(CheckScene& scene) {
  const LogConclusion conclusion = concludeOnLogs(scene.context);
  Check check{"last-log"};
  check.state = conclusion.outcome ? stateOf(*conclusion.outcome) : CheckState::Unknown;
  check.text = format("the %s: %s", conclusion.runText(), conclusion.text());
  if (scene.context.hasComplaints()) {
    check.state = CheckState::Unknown;
    check.text = "preferences cannot be read";
  }
  // A device that sends nothing needs no whitelist, but a faulty whitelist is a mistake even there.
  const WhitelistState& whitelist = conclusion.whitelist;
  const bool sendsNothing = conclusion.outcome == LogOutcome::NotPermitted ||
                            conclusion.outcome == LogOutcome::PermissionUnknown;
  if (!whitelist.fault.empty() && !(whitelist.isMissing && sendsNothing)) {
    addFinding(check, whitelist.isClosed ? CheckState::Unknown : CheckState::Warning,
               whitelist.fault);
  }
  scene.checks.push_back(std::move(check));
}

}  // namespace tavrel
