// The structured storage log: the storage driver's detailed lists, written out for diagnosis.
//
//   DumpStorageStructuredLog(platform, false);
//
// Telemetry of the flash channels and the grown defects become structured records. The block
// validity histogram goes to the NAND log when write amplification exceeds a threshold (the
// preference "userWAmp" of domain "com.norvane.NANDInfo", a real number above 0 and below 10,
// otherwise 2.0), or when collection is forced.
#pragma once

#include "platform/platform.h"
#include "storage/nand_exporters.h"

namespace tavrel {

/// Flash writes per host write in the last run; 0 when unknown.
extern double gCurrentUserWamp;
/// The same within the intermediate bands.
extern double gCurrentSysWamp;
/// Clients set this to log the validity list whatever the write amplification.
extern bool gForceCollectionSet;
/// Whether the last run had to log the validity list.
extern bool gNeedValidityList;

/// Fetches and logs each list that the driver offers; true when all fetched lists could be logged.
/// `requestFlag` is passed on to the driver. Diagnostics go to standard error.
bool DumpStorageStructuredLog(Platform& platform, bool requestFlag);

/// The same for the lists of a given service, whose row is `exporter`, with the current write
/// amplification.
bool logStorageLists(Platform& platform, DriverService& service, const NandExporter& exporter,
                     bool requestFlag);

}  // namespace tavrel
