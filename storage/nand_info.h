// The NAND information: the health of the device's flash in one dictionary.
//
//   const plist::Dictionary info = CopyNANDInfo(platform);
//   if (info.contains(kNANDInfoErrorKey)) complain(info.string(kNANDInfoErrorMessageKey));
//
// Keys stand in storage/nand_info_keys.h and storage/key_map_table.h. Every call asks the driver
// anew.
#pragma once

#include <cstdint>

#include "base/plist.h"
#include "platform/platform.h"
#include "storage/parse/asp_context.h"

namespace tavrel {

/// All figures, or the two error keys.
plist::Dictionary CopyNANDInfo(Platform& platform);

/// Adds the figures, without the versions and the demo mode, to `target`; nothing when they cannot
/// be had.
void DumpNANDInfo(Platform& platform, plist::Dictionary& target);

/// What a parsed buffer says. Without an export version, or with 0: the two error keys, or an empty
/// handle in log mode, in which the versions and the demo mode are left out.
plist::Dictionary buildNANDInfo(Preferences& preferences, const ASPContext& context, bool logMode);

/// Stores an entry, in the place of one with the same key.
void CopyDictionary(const plist::String& key, const plist::Value& value, plist::Dictionary& target);

/// The low 32 bits of a duration to three significant figures. Halves go up; a number of three
/// digits, which would not change, comes out one higher.
std::int64_t roundMaximumDuration(std::uint64_t value);

}  // namespace tavrel
