// The lines of JSON in which an upload server notes the metadata of logs, in the format of
// docs/examples/upload/nginx.conf.
#pragma once

#include <cstddef>
#include <ctime>
#include <optional>
#include <string>
#include <string_view>
#include <unordered_map>

#include "base/expected.h"
#include "base/keyed_hash.h"
#include "fleet/logs/log_metadata.h"

namespace tavrel::fleet {

class UploadLines {
 public:
  /// Adds the lines of a file, which may be compressed with gzip. A later line about the same log
  /// replaces an earlier one. Returns how many lines do not describe a log that has arrived.
  Expected<std::size_t> read(const std::string& path);

  bool empty() const { return logs_.empty(); }

  /// Null when no line describes the log, whose name must end with ".log".
  const LogMetadata* find(std::string_view device, std::string_view log) const;

  /// Whether the line of a log that was written at this time may follow in a file that has been
  /// read. The server writes it once the log is in its place.
  bool mayFollow(std::time_t written) const;

 private:
  bool add(std::string_view line);

  std::optional<std::time_t> asked_;  // when the first file was read

  std::unordered_map<std::string, LogMetadata, KeyedHash> logs_;  // by "DEVICE/LOG"
};

}  // namespace tavrel::fleet
