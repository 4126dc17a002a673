// The structured storage log: the storage driver's detailed lists, written out for diagnosis.
//
//   DumpStorageStructuredLog(platform, false);
//
// Telemetry of the flash channels and the grown defects become structured records. The block
// validity histogram goes to the NAND log, when writes are amplified beyond a threshold (the
// preference "userWAmp" of domain "com.norvane.NANDInfo", a real number above 0 and below 10, else
// 2.0) or collection is forced.
#pragma once

#include "platform/platform.h"
#include "storage/nand_exporters.h"

namespace tavrel {

/// Writes to flash per write of the host in the last run; 0 when unknown.
extern double gCurrentUserWamp;
/// The same within the intermediate bands.
extern double gCurrentSysWamp;
/// Set by a client that wants the validity list logged whatever the write amplification is.
extern bool gForceCollectionSet;
/// Whether the last run was to log the validity list.
extern bool gNeedValidityList;

/// Fetches and logs every list that the driver offers; true when all that were fetched could be
/// logged. `requestFlag` is handed to the driver. Diagnostics go to standard error.
bool DumpStorageStructuredLog(Platform& platform, bool requestFlag);

/// The same for the lists of a service that was found before, in the way of a row, with the figures
/// as they stand.
bool logStorageLists(Platform& platform, DriverService& service, const NandExporter& exporter,
                     bool requestFlag);

}  // namespace tavrel
