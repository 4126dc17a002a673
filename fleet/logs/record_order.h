// Sorts the rows of a record and checks that they agree with each other.
#pragma once

#include <string>

#include "fleet/model/log_record.h"

namespace tavrel::fleet {

/// Sorts scalars and distributions by key, and cells by key and interval. Returns why the rows
/// cannot be those of a log: a key occurs twice, buckets overlap, or a histogram does not count
/// exactly the values of its distribution. Empty when they can.
std::string putInOrder(LogRecord& record);

}  // namespace tavrel::fleet
