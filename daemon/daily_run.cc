#include "daemon/daily_run.h"

#include <string>

#include "base/arithmetic.h"
#include "daemon/tasking.h"
#include "platform/guarded.h"
#include "platform/persisted_state.h"
#include "report/bh_report.h"
#include "storage/daily_statistics.h"

namespace tavrel {

namespace {

struct DailyWork {
  Platform& platform;
  std::int32_t day;
  const plist::Array& appInfo;
  const StepObserver& onStep;
  LogOutcome logOutcome = LogOutcome::NotFiled;  // until the report is finished
};

void report(DailyWork& work) {
  Platform& platform = work.platform;
  SubmissionService& submission = platform.submission;
  work.logOutcome = submission.isDiagnosticSubmissionEnabled()
                        ? BHReport(platform).writeLogForYesterday(work.day, work.appInfo)
                    : submission.isPermissionReadable() ? LogOutcome::NotPermitted
                                                        : LogOutcome::PermissionUnknown;
  // The error of a log that could not be filed is already logged.
  if (work.logOutcome == LogOutcome::Filed || work.logOutcome == LogOutcome::NotFiled) return;
  platform.log->write(LogLevel::Info, logOutcomeText(work.logOutcome, std::to_string(work.day)));
}

struct DailyTask {
  const char* name;
  const char* purpose;  // completes "cannot ..." when an exception ends the task
  void (*run)(DailyWork& work);
};

constexpr DailyTask kDailyTasks[] = {
    {"Checkpoint of the statistics store", "checkpoint the store",
     [](DailyWork& work) { work.platform.statistics->BHClientCheckpoint(); }},
    {"Report", "finish the daily log", report},
    {"Storage statistics", "finish the storage statistics",
     [](DailyWork& work) { dailyStorageStatistics(work.platform, work.onStep); }},
    {"Clean-up of structured records", "clean up structured records",
     [](DailyWork& work) { work.platform.crashReporting->FLDumpAllOldStructuredDataLogs(); }},
    {"OS changes and tasking", "finish tracking OS updates and tasking",
     [](DailyWork& work) { trackOSChangeAndTasking(work.platform); }},
    {"Roll-over of the support log", "roll the support log",
     [](DailyWork& work) { work.platform.crashReporting->rollNorvaneCareLogs(); }},
};

/// A longer gap between two runs means that the clock was set.
constexpr std::int64_t kLongestGapDays = 3660;

void noteDaysPassedOver(SystemLog& log, std::int64_t lastRunDay, std::int32_t yesterday) {
  const std::int64_t sinceRun = wrappingSubtract(yesterday, lastRunDay);
  if (sinceRun <= 1 || sinceRun > kLongestGapDays) return;
  if (sinceRun == 2) {
    log.log(LogLevel::Info, "1 day had no daily run, and has a log only if one was forced: %lld",
            lastRunDay + 1);
  } else {
    log.log(LogLevel::Info, "%lld days had no daily run, and have logs only if forced: %lld to %d",
            sinceRun - 1, lastRunDay + 1, previousDay(yesterday));
  }
}

}  // namespace

std::optional<LogOutcome> runDailyIfNeeded(Platform& platform, const plist::Array& appInfo,
                                           const StepObserver& onStep) {
  beginStep(onStep, "Once-a-day gate");
  const std::int32_t yesterday = previousDay(platform.statistics->BHDaysSince1970());
  bool hasRun = false;
  const std::int64_t lastRunDay =
      platform.preferences->ZTXPreferencesGetIntegerValue(kLastRunDayKey, kTavrelDomain, &hasRun);
  if (lowInt32(lastRunDay) >= yesterday) {
    platform.log->log(LogLevel::Default, "Day unchanged since last run");
    return std::nullopt;
  }
  if (hasRun) noteDaysPassedOver(platform.log, lastRunDay, yesterday);
  const LogOutcome outcome = dailyTasksForDay(platform, yesterday, appInfo, onStep);
  beginStep(onStep, "End of the gated run");
  // Values that the tasks have set must not be lost once the day counts as done.
  bool isKept = false;
  runGuarded(platform.log, "checkpoint the store after the tasks",
             [&] { isKept = platform.statistics->BHClientCheckpoint(); });
  if (isKept) {
    rememberLogOutcome(platform.preferences, outcome);
    platform.preferences->ZTXPreferencesSetValue(kLastRunDayKey, yesterday, kTavrelDomain);
  } else {
    platform.log->log(LogLevel::Error,
                      "the run's statistics could not be saved: another run today repeats day %d",
                      yesterday);
  }
  platform.preferences->ZTXPreferencesSynchronize(kTavrelDomain);
  return outcome;
}

LogOutcome dailyTasksForDay(Platform& platform, std::int32_t day, const plist::Array& appInfo,
                            const StepObserver& onStep) {
  DailyWork work{platform, day, appInfo, onStep};
  beginStep(onStep, "Daily tasks");
  platform.log->log(LogLevel::Default, "%s%d", kTasksBegin, day);
  for (const DailyTask& task : kDailyTasks) {
    beginStep(onStep, task.name);
    runGuarded(platform.log, task.purpose, [&] { task.run(work); });
  }
  return work.logOutcome;
}

}  // namespace tavrel
