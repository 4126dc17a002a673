// Turns what was found into a record, or into the reason why there is none.
#pragma once

#include <optional>

#include "fleet/loading/permitted_keys.h"
#include "fleet/logs/log_reader.h"
#include "fleet/sources/source_item.h"

namespace tavrel::fleet {

struct ReadItem {
  /// `File` or `Content` after a successful read; a refused item keeps its path or content.
  SourceItem source;
  std::optional<LogRecord> record;
  std::size_t bytes = 0;  // of the document that was read
};

/// Without whitelists, `permitted` permits everything.
ReadItem readItem(SourceItem item, LogReader& reader, const PermittedKeys& permitted);

}  // namespace tavrel::fleet
