#include "storage/fetch_statistics.h"

#include <cstdint>
#include <optional>

#include "storage/device_buffer.h"
#include "storage/driver_client.h"
#include "storage/selector_request.h"

namespace tavrel {
namespace {

// A table that begins with this number means that the driver does not offer the list.
constexpr std::uint32_t kNoSelector = 0xFFFFFFFF;

bool fetchOver(UserClient& client, const NandExporter& exporter, StandardStreams& streams,
               ASPContext& context) {
  // A driver without a table is called without a request.
  const SelectorTable* table = nullptr;
  if (exporter.statistics) {
    table = exporter.statistics();
    if (!table || table->sizeQuery == kNoSelector) return false;
  }
  std::optional<SelectorRequest> request;
  const auto requestBytes = [&] { return request ? request->bytes() : ByteSpan(); };

  if (table) request = SelectorRequest::sizeQuery(*table);
  std::uint32_t size = 0;
  if (const auto status = querySize(client, exporter, requestBytes(), size)) {
    streams.printError("IOConnectCallStructMethod: %d", status);
    return false;
  }
  const DeviceBuffer buffer = DeviceBuffer::allocate(size);
  if (!buffer) {
    streams.printError("Could not valloc %lld bytes", std::int64_t{size});
    return false;
  }
  if (table) request = SelectorRequest::fetch(*table);
  std::size_t length = 0;
  if (fetchList(client, exporter, requestBytes(), buffer.bytes(), length) != kKernelSuccess) {
    streams.printError("Could not retrieve data from driver for selector %x\n",
                       table ? table->fetch : 0);
    return false;
  }
  return exporter.parse && exporter.parse(context, buffer.bytes().first(length)) != 0;
}

}  // namespace

bool fetchStatistics(DriverRegistry& drivers, StandardStreams& streams,
                     const NandExporter*& exporter, ASPContext& context) {
  const auto service = findNandExporter(drivers, exporter);
  if (!service) {
    streams.writeError("Could not get matching Kernkit service for exporting classes\n");
    return false;
  }
  return withClient(*service, streams, [&](UserClient& client) {
    return fetchOver(client, *exporter, streams, context);
  });
}

}  // namespace tavrel
