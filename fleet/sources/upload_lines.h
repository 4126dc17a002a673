// The lines of JSON in which a server that receives uploads notes the metadata of logs, as
// docs/examples/upload/nginx.conf has them.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <unordered_map>

#include "base/expected.h"
#include "base/keyed_hash.h"
#include "fleet/logs/log_metadata.h"

namespace tavrel::fleet {

class UploadLines {
 public:
  /// Adds the lines of a file, which may be in gzip's form. A later line about the same log counts.
  /// Yields how many lines say nothing of a log that has arrived.
  Expected<std::size_t> read(const std::string& path);

  /// Null when there is no line about the log, whose name ends with ".log".
  const LogMetadata* find(std::string_view device, std::string_view log) const;

 private:
  bool add(std::string_view line);

  std::unordered_map<std::string, LogMetadata, KeyedHash> logs_;  // by "DEVICE/LOG"
};

}  // namespace tavrel::fleet
