// The rows of a record in their order, and what they must have in common.
#pragma once

#include <string>

#include "fleet/model/log_record.h"

namespace tavrel::fleet {

/// Sorts scalars and distributions by key, cells by key and interval. Yields why the rows are no
/// log's: a key is there twice, buckets overlap, or a histogram does not count the values of its
/// distribution. Empty when they are.
std::string putInOrder(LogRecord& record);

}  // namespace tavrel::fleet
