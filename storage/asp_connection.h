// Connections to the storage driver, and its advice on freeing space.
//
//   ASPConnection connection;
//   if (openASPConnection(drivers, streams, connection)) connection.connection->callMethod(...);
//   closeASPConnection(connection);
//
// What is not closed by name is closed when it goes out of scope. Failures are told on standard
// error.
#pragma once

#include <memory>

#include "platform/driver_registry.h"
#include "platform/standard_streams.h"
#include "storage/nand_exporters.h"

namespace tavrel {

struct ASPConnection {
  std::shared_ptr<DriverService> service;
  std::unique_ptr<UserClient> connection;
  const NandExporter* exporter = nullptr;
};

/// True when the driver is there, could be opened and has statistics of the known format; else the
/// record is closed again.
bool openASPConnection(DriverRegistry& drivers, StandardStreams& streams,
                       ASPConnection& connection);

/// Harmless on a record that is closed.
void closeASPConnection(ASPConnection& connection);

/// A connection to the first driver that is present, null when there is none. `exporter` receives
/// its row.
std::unique_ptr<UserClient> ANDConnect(DriverRegistry& drivers, StandardStreams& streams,
                                       const NandExporter*& exporter);

/// Closes; an empty handle is one whose closing fails.
void ANDDisconnect(StandardStreams& streams, std::unique_ptr<UserClient> connection);

/// Whether the controller recommends deleting content.
bool NandRecommendsContentDeletion(DriverRegistry& drivers, StandardStreams& streams);

}  // namespace tavrel
