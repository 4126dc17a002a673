// A connection to a recorded driver, whose numbered methods are answered from its "Methods".
//
// The first row that fits a call answers it; a call that no row fits fails with 0xE00002C2. An
// answer that is longer than the caller's buffer fails with 0xE00002E7 and writes nothing.
#pragma once

#include <memory>

#include "base/plist.h"
#include "platform/user_client.h"

namespace tavrel {

/// `record` is the driver's entry in its recording, which is shared.
std::unique_ptr<UserClient> connectToRecordedDriver(const plist::Dictionary& record);

}  // namespace tavrel
