// The fleet on one page, for decision makers.
#pragma once

#include <optional>
#include <string>
#include <vector>

#include "fleet/questions/compare.h"
#include "fleet/questions/show.h"
#include "fleet/questions/summary.h"

namespace tavrel::fleet {

struct FleetPage {
  SummaryAnswer summary;
  std::optional<CompareAnswer> comparison;  // of the two newest versions
  std::vector<ShowAnswer> wear;             // of the flash, by version
  std::vector<ShowAnswer> statistics;       // others, by version
  std::size_t furtherStatistics = 0;        // statistics that the page has no room for
};

/// Asks all questions of the page in one run. Throws EngineError.
FleetPage askForPage(Engine& engine, Ledger& ledger, const DayRange& days);

/// Renders the page as one HTML file.
std::string textOf(const FleetPage& page);

}  // namespace tavrel::fleet
