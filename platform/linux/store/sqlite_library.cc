#include "platform/linux/store/sqlite_library.h"

#include <dlfcn.h>
#include <string>

#include "platform/linux/store/sqlite_connection.h"

namespace tavrel {
namespace {

// The name that a linked program would load; it guarantees the interface of the header.
constexpr const char* kFile = "libsqlite3.so.0";

[[noreturn]] void refuse() {
  const char* const reason = dlerror();
  throw StoreFailure{StoreFault::Other, std::string("cannot load SQLite: ") +
                                            (reason ? reason : kFile) +
                                            ": install the package libsqlite3-0"};
}

template <class Function>
void find(void* library, const char* name, Function& function) {
  void* const found = dlsym(library, name);
  if (!found) refuse();
  function = reinterpret_cast<Function>(found);
}

SqliteLibrary load() {
  // Never unloaded: the functions found in it are used until the process ends.
  void* const library = dlopen(kFile, RTLD_NOW | RTLD_LOCAL);
  if (!library) refuse();
  SqliteLibrary functions{};
  find(library, "sqlite3_open_v2", functions.open_v2);
  find(library, "sqlite3_interrupt", functions.interrupt);
  find(library, "sqlite3_close_v2", functions.close_v2);
  find(library, "sqlite3_busy_handler", functions.busy_handler);
  find(library, "sqlite3_db_config", functions.db_config);
  find(library, "sqlite3_db_filename", functions.db_filename);
  find(library, "sqlite3_file_control", functions.file_control);
  find(library, "sqlite3_exec", functions.exec);
  find(library, "sqlite3_wal_checkpoint_v2", functions.wal_checkpoint_v2);
  find(library, "sqlite3_errmsg", functions.errmsg);
  find(library, "sqlite3_errstr", functions.errstr);
  find(library, "sqlite3_system_errno", functions.system_errno);
  find(library, "sqlite3_prepare_v2", functions.prepare_v2);
  find(library, "sqlite3_finalize", functions.finalize);
  find(library, "sqlite3_db_handle", functions.db_handle);
  find(library, "sqlite3_bind_int64", functions.bind_int64);
  find(library, "sqlite3_bind_blob64", functions.bind_blob64);
  find(library, "sqlite3_bind_null", functions.bind_null);
  find(library, "sqlite3_step", functions.step);
  find(library, "sqlite3_changes", functions.changes);
  find(library, "sqlite3_reset", functions.reset);
  find(library, "sqlite3_column_type", functions.column_type);
  find(library, "sqlite3_column_int64", functions.column_int64);
  find(library, "sqlite3_column_blob", functions.column_blob);
  find(library, "sqlite3_column_bytes", functions.column_bytes);
  return functions;
}

}  // namespace

const SqliteLibrary& sqlite() {
  static const SqliteLibrary functions = load();
  return functions;
}

}  // namespace tavrel
