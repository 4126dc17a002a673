// The daily run: the day's tasks in their fixed order, at most once per calendar day.
#pragma once

#include <cstdint>
#include <optional>

#include "base/plist.h"
#include "platform/platform.h"
#include "platform/step_observer.h"
#include "report/log_outcome.h"

namespace tavrel {

/// The gated run: does yesterday's tasks unless they are done, and remembers the day. `appInfo` is
/// the list of activated applications, an empty handle when there is none. `onStep` hears of the
/// gate, of each task, and of the end. Yields the outcome of the log; nothing if the day was done.
std::optional<LogOutcome> runDailyIfNeeded(Platform& platform, const plist::Array& appInfo,
                                           const StepObserver& onStep = {});

/// The tasks for one day, without the gate. No task's failure, not even an exception, stops the
/// ones after it. Yields the outcome of the log; when no log was filed, an info line says why.
LogOutcome dailyTasksForDay(Platform& platform, std::int32_t day, const plist::Array& appInfo,
                            const StepObserver& onStep = {});

}  // namespace tavrel
