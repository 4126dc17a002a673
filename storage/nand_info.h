// The NAND information: the health of the device's flash in one dictionary.
//
//   const plist::Dictionary info = CopyNANDInfo(platform);
//   if (info.contains(kNANDInfoErrorKey)) complain(info.string(kNANDInfoErrorMessageKey));
//
// The keys are in storage/nand_info_keys.h and storage/key_map_table.h. Each call queries the
// driver.
#pragma once

#include <cstdint>

#include "base/plist.h"
#include "platform/platform.h"
#include "storage/parse/asp_context.h"

namespace tavrel {

/// All figures, or the two error keys.
plist::Dictionary CopyNANDInfo(Platform& platform);

/// Adds the figures, without the versions and the demo mode, to `target`; adds nothing when they
/// are not available.
void DumpNANDInfo(Platform& platform, plist::Dictionary& target);

/// The figures of a parsed buffer; log mode leaves out the versions and the demo mode. When the
/// export version is missing or 0: the two error keys, or an empty handle in log mode.
plist::Dictionary buildNANDInfo(Preferences& preferences, const ASPContext& context, bool logMode);

/// Stores an entry, replacing one with the same key.
void CopyDictionary(const plist::String& key, const plist::Value& value, plist::Dictionary& target);

/// Rounds the low 32 bits of a duration to three significant figures, halves up. A three-digit
/// number comes out one higher.
std::int64_t roundMaximumDuration(std::uint64_t value);

}  // namespace tavrel
