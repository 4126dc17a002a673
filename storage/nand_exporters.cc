#include "storage/nand_exporters.h"

#include "storage/parse/asp_parser.h"

namespace tavrel {
namespace {

// Both kinds of drivers offer the same lists in the same format.
constexpr NandExporter exporterOf(std::string_view className, std::string_view characteristics,
                                  std::int32_t contentDeletionSelector, std::uint32_t sizeSelector,
                                  std::uint32_t dataSelector) {
  return {.className = className,
          .characteristicsProperty = characteristics,
          .contentDeletionSelector = contentDeletionSelector,
          .sizeSelector = sizeSelector,
          .dataSelector = dataSelector,
          .statistics = ASPGetStatsSelectors,
          .defectsList = ASPGetDefectsListSelectors,
          .telemetryList = ASPGetTelemetryListSelectors,
          .taskScheduler = ASPGetTaskSchedulerSelectors,
          .snapshot = ASPGetSnapshotSelectors,
          .snapshotHeader = ASPGetSnapshotHeaderSelectors,
          .bandStatistics = ASPGetBandStatsSelectors,
          .parse = ASPParseBufferToCxt,
          .release = ASPReleaseContext};
}

}  // namespace

constinit const NandExporter nand_exporters[3] = {
    exporterOf("ASPStorage", "Device Characteristics", 5, 8, 8),
    exporterOf("NorvaneEmbeddedNVMeController", "Controller Characteristics", -1, 9, 9),
    {},
};

std::shared_ptr<DriverService> findNandExporter(DriverRegistry& drivers,
                                                const NandExporter*& exporter) {
  for (exporter = nand_exporters; !exporter->className.empty(); ++exporter) {
    if (auto service = drivers.firstService(exporter->className)) return service;
  }
  return nullptr;
}

}  // namespace tavrel
