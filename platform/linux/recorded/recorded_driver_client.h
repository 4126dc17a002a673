// A connection to a recorded driver, whose numbered methods are answered from its rows.
//
// The first row that fits a call answers it; a call that no row fits fails with 0xE00002C2. An
// answer that is longer than the caller's buffer fails with 0xE00002E7 and writes nothing.
#pragma once

#include <memory>

#include "platform/linux/recorded/recording.h"
#include "platform/user_client.h"

namespace tavrel {

/// `driver` is an entry of `recording`.
std::unique_ptr<UserClient> connectToRecordedDriver(std::shared_ptr<const Recording> recording,
                                                    const RecordedEntry& driver);

}  // namespace tavrel
