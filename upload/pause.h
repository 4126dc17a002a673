// How long the uploader waits after failures.
#pragma once

#include <cstdint>

#include "base/plist.h"
#include "platform/linux/runs/upload_state.h"

namespace tavrel::upload {

/// Seconds until the next attempt after this many failed transfers in a row. `serverWish` is the
/// delay that the server asked for in the last one (0: none). `chance`, from 0 to 1, spreads
/// devices that failed at the same time.
double pauseSeconds(std::int64_t failedTransfers, std::int64_t serverWish, double chance);

/// Whether an attempt must wait. A time farther ahead than any pause was noted under
/// another clock, and is ignored.
bool mustWait(const UploadState& state, plist::Date now);

}  // namespace tavrel::upload
