#include "daemon/daily_run.h"

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
};

struct DailyTask {
  const char* name;
  const char* purpose;  // completes "cannot ..." when an exception ends the task
  void (*run)(const DailyWork& work);
};

constexpr DailyTask kDailyTasks[] = {
    {"Checkpoint of the statistics store", "checkpoint the store",
     [](const DailyWork& work) { work.platform.statistics->BHClientCheckpoint(); }},
    {"Report", "finish the daily log",
     [](const DailyWork& work) {
       if (work.platform.submission->isDiagnosticSubmissionEnabled()) {
         BHReport(work.platform).writeLogForYesterday(work.day, work.appInfo);
       }
     }},
    {"Storage statistics", "finish the storage statistics",
     [](const DailyWork& work) { dailyStorageStatistics(work.platform, work.onStep); }},
    {"Clean-up of structured records", "clean up structured records",
     [](const DailyWork& work) { work.platform.crashReporting->FLDumpAllOldStructuredDataLogs(); }},
    {"Changes of the system, and tasking", "finish tracking OS updates and tasking",
     [](const DailyWork& work) { trackOSChangeAndTasking(work.platform); }},
    {"Roll-over of the support log", "roll the support log",
     [](const DailyWork& work) { work.platform.crashReporting->rollNorvaneCareLogs(); }},
};

}  // namespace

void runDailyIfNeeded(Platform& platform, const plist::Array& appInfo, const StepObserver& onStep) {
  beginStep(onStep, "Once-a-day gate");
  const std::int32_t yesterday = previousDay(platform.statistics->BHDaysSince1970());
  const std::int32_t lastRunDay =
      lowInt32(platform.preferences->ZTXPreferencesGetIntegerValue(kLastRunDayKey, kTavrelDomain));
  if (lastRunDay >= yesterday) {
    platform.log->log(LogLevel::Default, "Day unchanged since last run");
    return;
  }
  dailyTasksForDay(platform, yesterday, appInfo, onStep);
  beginStep(onStep, "End of the gated run");
  // What the tasks have set must not be lost to a kill once the day counts as done.
  runGuarded(platform.log, "checkpoint the store after the tasks",
             [&] { platform.statistics->BHClientCheckpoint(); });
  platform.preferences->ZTXPreferencesSetValue(kLastRunDayKey, yesterday, kTavrelDomain);
  platform.preferences->ZTXPreferencesSynchronize(kTavrelDomain);
}

void dailyTasksForDay(Platform& platform, std::int32_t day, const plist::Array& appInfo,
                      const StepObserver& onStep) {
  const DailyWork work{platform, day, appInfo, onStep};
  beginStep(onStep, "Daily tasks");
  platform.log->log(LogLevel::Default, "daily tasks for day %d", day);
  for (const DailyTask& task : kDailyTasks) {
    beginStep(onStep, task.name);
    runGuarded(platform.log, task.purpose, [&] { task.run(work); });
  }
}

}  // namespace tavrel
