// Logs the lists of the storage driver. All their fields are little-endian.
//
// A callback takes a list's buffer and the controller's characteristics, and returns whether the
// list could be logged. Diagnostics go to standard error. Reading texts and making small
// dictionaries cannot fail, so there are no diagnostics for them.
#pragma once

#include "base/bytes.h"
#include "base/plist.h"
#include "platform/platform.h"

namespace tavrel {

using ListCallback = bool (*)(Platform& platform, ByteSpan buffer,
                              const plist::Value& characteristics);

/// Writes the validity of blocks by bucket, the write amplification and the NAND information to the
/// NAND log, when this run needs it (`gNeedValidityList`).
bool logValidityList(Platform& platform, ByteSpan buffer, const plist::Value& characteristics);

/// Files one structured record for each flash channel.
bool logTelemetryList(Platform& platform, ByteSpan buffer, const plist::Value& characteristics);

/// Files the factory's count of bad blocks and one structured record for each defect that has grown
/// since, as far as the buffer holds them.
bool logDefectsList(Platform& platform, ByteSpan buffer, const plist::Value& characteristics);

}  // namespace tavrel
