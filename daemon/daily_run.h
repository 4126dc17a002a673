// The daily run: the day's tasks in their fixed order, at most once per calendar day.
#pragma once

#include <cstdint>
#include <optional>

#include "base/plist.h"
#include "platform/platform.h"
#include "platform/step_observer.h"
#include "report/log_outcome.h"

namespace tavrel {

/// The gated run: does yesterday's tasks unless they are done, and records the day. `appInfo` is
/// the list of activated applications, an empty handle when there is none. Calls `onStep` for the
/// gate, each task, and the end. Returns the outcome of the log; nothing if the day was done
/// already.
std::optional<LogOutcome> runDailyIfNeeded(Platform& platform, const plist::Array& appInfo,
                                           const StepObserver& onStep = {});

/// The tasks for one day, without the gate. A task's failure, even an exception, does not stop
/// later tasks. Returns the outcome of the log; when no log was filed, an info line, or
/// errors when filing failed, say why.
LogOutcome dailyTasksForDay(Platform& platform, std::int32_t day, const plist::Array& appInfo,
                            const StepObserver& onStep = {});

}  // namespace tavrel
