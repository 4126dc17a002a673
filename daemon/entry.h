// The entry point, called by `main`: does what the command line asks for.
#pragma once

#include <chrono>
#include <optional>
#include <span>

#include "platform/platform.h"
#include "platform/run_kind.h"

namespace tavrel {

/// How long the service waits without an event before it ends.
inline constexpr std::chrono::milliseconds kIdleSlice{10'000};

/// The run that the command line asks for. `arguments` begins with the program's name. Nothing for
/// arguments that do no tasks.
std::optional<RunKind> runKindOf(std::span<const char* const> arguments);

/// Runs the process. Without an argument it serves clients until one slice has passed without an
/// event; "-d" is the gated daily run, "-f" and "-t" force the tasks of yesterday and today. "-h",
/// "--help" and "--version" print on standard output. The exit status is always 0.
int runTavrel(Platform& platform, std::span<const char* const> arguments,
              std::chrono::milliseconds idleSlice = kIdleSlice);

}  // namespace tavrel
