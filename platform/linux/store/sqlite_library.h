// SQLite, loaded when it is first used.
//
// Most runs of the daemon find the day's tasks done and never open the store. Resolving the
// library's symbols would take longer than the rest of such a run.
#pragma once

#include <sqlite3.h>

namespace tavrel {

/// The functions of the library that the store calls, under their names without "sqlite3_".
struct SqliteLibrary {
  decltype(&sqlite3_open_v2) open_v2;
  decltype(&sqlite3_interrupt) interrupt;
  decltype(&sqlite3_close_v2) close_v2;
  decltype(&sqlite3_busy_handler) busy_handler;
  decltype(&sqlite3_db_config) db_config;
  decltype(&sqlite3_db_filename) db_filename;
  decltype(&sqlite3_file_control) file_control;
  decltype(&sqlite3_exec) exec;
  decltype(&sqlite3_wal_checkpoint_v2) wal_checkpoint_v2;
  decltype(&sqlite3_errmsg) errmsg;
  decltype(&sqlite3_errstr) errstr;
  decltype(&sqlite3_system_errno) system_errno;
  decltype(&sqlite3_prepare_v2) prepare_v2;
  decltype(&sqlite3_finalize) finalize;
  decltype(&sqlite3_db_handle) db_handle;
  decltype(&sqlite3_bind_int64) bind_int64;
  decltype(&sqlite3_bind_blob64) bind_blob64;
  decltype(&sqlite3_bind_null) bind_null;
  decltype(&sqlite3_step) step;
  decltype(&sqlite3_changes) changes;
  decltype(&sqlite3_reset) reset;
  decltype(&sqlite3_column_type) column_type;
  decltype(&sqlite3_column_int64) column_int64;
  decltype(&sqlite3_column_blob) column_blob;
  decltype(&sqlite3_column_bytes) column_bytes;
};

/// Throws a `StoreFailure` when the library cannot be loaded. Later calls do not load it again.
const SqliteLibrary& sqlite();

}  // namespace tavrel
