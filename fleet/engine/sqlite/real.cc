#include "fleet/engine/sqlite/real.h"

#include <cmath>
#include <sqlite3.h>

#include "base/copy_little.h"

namespace tavrel::fleet {

double realOf(sqlite3_value* value) {
  switch (sqlite3_value_type(value)) {
    case SQLITE_NULL:
      return kUsualNan;
    case SQLITE_BLOB: {
      double real = kUsualNan;
      if (sqlite3_value_bytes(value) == sizeof real)
        copyLittle(&real, sqlite3_value_blob(value), sizeof real);
      return real;
    }
    default:
      return sqlite3_value_double(value);
  }
}

void setResult(sqlite3_context* result, double value) {
  if (std::isnan(value) && !isUsualNan(value)) {
    char bytes[sizeof value];
    copyLittle(bytes, &value, sizeof value);
    sqlite3_result_blob(result, bytes, sizeof bytes, SQLITE_TRANSIENT);
  } else {
    sqlite3_result_double(result, value);
  }
}

}  // namespace tavrel::fleet
