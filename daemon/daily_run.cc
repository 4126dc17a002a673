#include "daemon/daily_run.h"

#include "base/arithmetic.h"
#include "config/persisted_state.h"
#include "daemon/tasking.h"
#include "platform/guarded.h"
#include "report/bh_report.h"
#include "storage/daily_statistics.h"

namespace tavrel {

void runDailyIfNeeded(Platform& platform, const plist::Array& appInfo) {
  const std::int32_t yesterday = previousDay(platform.statistics.BHDaysSince1970());
  const std::int32_t lastRunDay =
      lowInt32(platform.preferences.ZTXPreferencesGetIntegerValue(kLastRunDayKey, kTavrelDomain));
  if (lastRunDay >= yesterday) {
    platform.log.log(LogLevel::Default, "Day unchanged since last run");
    return;
  }
  dailyTasksForDay(platform, yesterday, appInfo);
  // What the tasks have set must not be lost to a kill once the day counts as done.
  runGuarded(platform.log, "checkpoint the store behind the tasks",
             [&] { platform.statistics.BHClientCheckpoint(); });
  platform.preferences.ZTXPreferencesSetValue(kLastRunDayKey, yesterday, kTavrelDomain);
  platform.preferences.ZTXPreferencesSynchronize(kTavrelDomain);
}

void dailyTasksForDay(Platform& platform, std::int32_t day, const plist::Array& appInfo) {
  const auto task = [&log = platform.log](const char* what, auto action) {
    runGuarded(log, what, action);
  };
  platform.log.log(LogLevel::Default, "daily tasks for day %d", day);
  task("checkpoint the store", [&] { platform.statistics.BHClientCheckpoint(); });
  task("finish the daily log", [&] {
    if (platform.submission.isDiagnosticSubmissionEnabled()) {
      BHReport(platform).writeLogForYesterday(day, appInfo);
    }
  });
  task("finish the storage statistics", [&] { dailyStorageStatistics(platform); });
  task("clean up structured records",
       [&] { platform.crashReporting.FLDumpAllOldStructuredDataLogs(); });
  task("finish tracking OS updates and tasking", [&] { trackOSChangeAndTasking(platform); });
  task("roll the support log", [&] { platform.crashReporting.rollNorvaneCareLogs(); });
}

}  // namespace tavrel
