// Logs the storage driver's lists. All their fields are little-endian.
//
// A callback takes a list's buffer and the controller's characteristics, and returns whether the
// list could be logged. Diagnostics go to standard error. When memory runs out, a callback throws
// `std::bad_alloc`, which ends this list only.
#pragma once

#include "base/bytes.h"
#include "base/plist.h"
#include "platform/platform.h"

namespace tavrel {

using ListCallback = bool (*)(Platform& platform, ByteSpan buffer,
                              const plist::Value& characteristics);

/// Writes the validity of blocks by bucket, the write amplification and the NAND information to the
/// NAND log, if this run has to (`gNeedValidityList`).
bool logValidityList(Platform& platform, ByteSpan buffer, const plist::Value& characteristics);

/// Files one structured record for each flash channel.
bool logTelemetryList(Platform& platform, ByteSpan buffer, const plist::Value& characteristics);

/// Files the factory's count of bad blocks, and one structured record for each grown defect that
/// the buffer contains.
bool logDefectsList(Platform& platform, ByteSpan buffer, const plist::Value& characteristics);

}  // namespace tavrel
