// The kinds of storage drivers that publish statistics, and the search for this device's driver.
#pragma once

#include <cstdint>
#include <memory>
#include <string_view>

#include "base/bytes.h"
#include "platform/driver_registry.h"
#include "storage/parse/asp_context.h"
#include "storage/parse/asp_selectors.h"

namespace tavrel {

/// A kind of driver. A null getter means that the driver does not offer that list.
struct NandExporter {
  std::string_view className = {};                // the registry class of its service
  std::string_view characteristicsProperty = {};  // a dictionary, on the service or its parents
  std::int32_t contentDeletionSelector = 0;       // method number; -1 when the driver has none
  std::uint32_t sizeSelector = 0;                 // method number of every size query
  std::uint32_t dataSelector = 0;                 // method number of every fetch
  SelectorGetter statistics = nullptr;
  SelectorGetter defectsList = nullptr;
  SelectorGetter telemetryList = nullptr;
  SelectorGetter taskScheduler = nullptr;
  SelectorGetter snapshot = nullptr;
  SelectorGetter snapshotHeader = nullptr;
  SelectorGetter bandStatistics = nullptr;
  SelectorGetter further[2] = {};  // no kind of driver has them yet
  int (*parse)(ASPContext& context, ByteSpan buffer) = nullptr;
  void (*release)(ASPContext& context) = nullptr;
};

/// In the order of the search. The last row ends the table; all its fields are empty.
extern const NandExporter nand_exporters[3];

/// The service of the first kind of driver that is present, null when none is. `exporter` then
/// refers to its row, or to the last one; rows live as long as the process.
std::shared_ptr<DriverService> findNandExporter(DriverRegistry& drivers,
                                                const NandExporter*& exporter);

}  // namespace tavrel
