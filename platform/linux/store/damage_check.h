// Checks whether a store that SQLite reports as damaged really is.
//
// SQLite reports a read that the device fails (EIO) as damage. Such a store must stay where it is.
#pragma once

#include <memory>
#include <optional>
#include <string>

#include "platform/linux/store/sqlite_connection.h"

namespace tavrel {

/// Whether SQLite's check of the whole store finds nothing wrong, including the order of rows.
bool isSound(SqliteConnection& connection);

/// Checks on connections of its own; this process must have no other open one. Nothing when the
/// store is damaged and every byte can be read; otherwise the failure to report instead. Takes as
/// long as reading the whole file. `leavesNoTrace`: see `openStoreForReading`.
std::optional<StoreFailure> confirmDamage(const std::string& path,
                                          const std::shared_ptr<BusyBudget>& busy,
                                          bool leavesNoTrace);

}  // namespace tavrel
