#include "fleet/engine/sqlite/pending_rows.h"

#include <new>
#include <sqlite3.h>

#include "fleet/engine/sqlite/real.h"

namespace tavrel::fleet {
namespace {

struct Table : sqlite3_vtab {
  RowSource* source;
};

struct Cursor : sqlite3_vtab_cursor {
  RowSource* source;
};

// SQLite calls the functions below. No exception may pass through it: that would leave its
// connection in an undefined state.

RowSource& sourceOf(sqlite3_vtab_cursor* cursor) {
  return *static_cast<Cursor*>(cursor)->source;
}

int connect(sqlite3* connection, void* context, int, const char* const*, sqlite3_vtab** out,
            char**) {
  auto* const table = new (std::nothrow) Table;
  if (table == nullptr) return SQLITE_NOMEM;
  static_cast<sqlite3_vtab&>(*table) = {};
  table->source = static_cast<RowSource*>(context);
  *out = table;
  return sqlite3_declare_vtab(connection, "CREATE TABLE rows(id, a, b, c, d, e)");
}

int disconnect(sqlite3_vtab* table) {
  delete static_cast<Table*>(table);
  return SQLITE_OK;
}

int plan(sqlite3_vtab*, sqlite3_index_info*) {
  return SQLITE_OK;
}

int open(sqlite3_vtab* table, sqlite3_vtab_cursor** out) {
  auto* const cursor = new (std::nothrow) Cursor;
  if (cursor == nullptr) return SQLITE_NOMEM;
  static_cast<sqlite3_vtab_cursor&>(*cursor) = {};
  cursor->source = static_cast<Table*>(table)->source;
  *out = cursor;
  return SQLITE_OK;
}

int close(sqlite3_vtab_cursor* cursor) {
  delete static_cast<Cursor*>(cursor);
  return SQLITE_OK;
}

int begin(sqlite3_vtab_cursor* cursor, int, const char*, int, sqlite3_value**) {
  sourceOf(cursor).rewind();
  return SQLITE_OK;
}

int next(sqlite3_vtab_cursor* cursor) {
  sourceOf(cursor).next();
  return SQLITE_OK;
}

int isAtEnd(sqlite3_vtab_cursor* cursor) {
  return sourceOf(cursor).atEnd() ? 1 : 0;
}

int column(sqlite3_vtab_cursor* cursor, sqlite3_context* result, int number) {
  if (number == 0) {
    sqlite3_result_int64(result, sourceOf(cursor).id());
  } else {
    sourceOf(cursor).value(result, number);
  }
  return SQLITE_OK;
}

int rowId(sqlite3_vtab_cursor* cursor, sqlite3_int64* out) {
  *out = sourceOf(cursor).id();
  return SQLITE_OK;
}

// A module without functions to create and destroy it is itself a table, of the same name.
constexpr sqlite3_module kModule = [] {
  sqlite3_module module{};
  module.xConnect = connect;
  module.xBestIndex = plan;
  module.xDisconnect = disconnect;
  module.xOpen = open;
  module.xClose = close;
  module.xFilter = begin;
  module.xNext = next;
  module.xEof = isAtEnd;
  module.xColumn = column;
  module.xRowid = rowId;
  return module;
}();

}  // namespace

void addRowTable(const Connection& connection, const char* name, RowSource& source) {
  const int code = sqlite3_create_module(connection.handle(), name, &kModule, &source);
  if (code != SQLITE_OK) connection.fail(code);
}

void setResult(sqlite3_context* result, std::int64_t value, int) {
  sqlite3_result_int64(result, value);
}

void setResult(sqlite3_context* result, const FiveNumbers* numbers, int column) {
  switch (column) {
    case 1:
      return setResult(result, numbers->minimum);
    case 2:
      return setResult(result, numbers->maximum);
    case 3:
      return setResult(result, numbers->mean);
    case 4:
      return setResult(result, numbers->squaredDeviations);
    default:
      return sqlite3_result_int64(result, static_cast<std::int64_t>(numbers->count));
  }
}

}  // namespace tavrel::fleet
