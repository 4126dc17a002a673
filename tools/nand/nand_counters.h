// Shows the counters of a NAND chip to people and programs.
#pragma once

#include <string_view>

#include "storage/telemetry_counters.h"
#include "tools/console/tool_output.h"

namespace tavrel {

/// {"parser": …, "counters": {"readStage": […], …}}
Json jsonOfCounters(std::string_view parser, const TelemetryCounters& counters);

/// Error bins as bars, the other arrays in rows of eight; arrays of zeros on one line.
void printCounters(const Page& page, std::string_view parser, const TelemetryCounters& counters);

}  // namespace tavrel
