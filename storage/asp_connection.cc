#include "storage/asp_connection.h"

#include <array>

#include "storage/driver_client.h"

namespace tavrel {

std::unique_ptr<UserClient> ANDConnect(DriverRegistry& drivers, StandardStreams& streams,
                                       const NandExporter*& exporter) {
  const auto service = findNandExporter(drivers, exporter);
  if (!service) {
    streams.writeError("No class found");
    return nullptr;
  }
  std::unique_ptr<UserClient> connection;
  if (const auto status = service->open(0, connection)) {
    streams.printError("IOServiceOpen failed for class '%s', result 0x%x\n", exporter->className,
                       status);
    return nullptr;
  }
  return connection;
}

void ANDDisconnect(StandardStreams& streams, std::unique_ptr<UserClient> connection) {
  if (!connection || connection->close() != kKernelSuccess) {
    streams.writeError("closing connection to service failed\n");
  }
}

bool openASPConnection(DriverRegistry& drivers, StandardStreams& streams,
                       ASPConnection& connection) {
  connection.service = findNandExporter(drivers, connection.exporter);
  if (!connection.service) {
    streams.writeError("Can't get ASP Connection, no matching service!\n");
    closeASPConnection(connection);
    return false;
  }
  connection.connection = ANDConnect(drivers, streams, connection.exporter);
  if (!connection.connection || connection.exporter->statistics != ASPGetStatsSelectors) {
    streams.writeError("Can't get ASP Connection!\n");
    closeASPConnection(connection);
    return false;
  }
  return true;
}

void closeASPConnection(ASPConnection& connection) {
  if (connection.connection) connection.connection->close();
  connection.connection = nullptr;
  connection.service = nullptr;
}

bool NandRecommendsContentDeletion(DriverRegistry& drivers, StandardStreams& streams) {
  const NandExporter* exporter = nullptr;
  const auto service = findNandExporter(drivers, exporter);
  if (exporter->contentDeletionSelector == -1) return false;
  if (!service) {
    streams.writeError(
        "_load_nand_infoCould not get matching Kernkit service for exporting classes\n");
    return false;
  }
  return withClient(*service, streams, [exporter](UserClient& client) {
    std::array<std::byte, 4> answer{};
    std::size_t length = answer.size();
    const KernelReturn status = client.callMethod(
        static_cast<std::uint32_t>(exporter->contentDeletionSelector), {}, {}, {}, answer, length);
    return status == kKernelSuccess && length >= answer.size() &&
           loadLittle32(answer, 0) != std::uint32_t{0};
  });
}

}  // namespace tavrel
