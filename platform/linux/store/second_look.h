// Whether a store that SQLite found damaged is.
//
// SQLite reports a read that the device fails (EIO) as damage. Such a store must stay where it is.
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "platform/linux/store/sqlite_connection.h"

namespace tavrel {

/// Whether SQLite's check of the whole store finds it as it should be: the order of rows, too.
bool isSound(SqliteConnection& connection);

/// Looks again, on connections of its own; this process must have no other one that is open.
/// Nothing when there is damage and every byte can be read, otherwise what to say of the store.
/// Takes as long as reading all of it. `leavesNoTrace` as for `openStoreForReading`.
std::optional<StoreFailure> doubtDamage(const std::string& path,
                                        const std::shared_ptr<BusyBudget>& busy,
                                        bool leavesNoTrace);

}  // namespace tavrel
