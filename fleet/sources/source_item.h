// What is found where logs are: a log that is still to be read, or why something is not.
#pragma once

#include <cstdint>
#include <functional>
#include <optional>
#include <string>

#include "fleet/logs/log_metadata.h"

namespace tavrel::fleet {

struct SourceItem {
  enum class Kind : std::uint8_t {
    kFile,     ///< the file `path`
    kContent,  ///< the bytes in `content`
    kRefused,  ///< a log that cannot be had
    kSkipped,  ///< nothing that could be a log, such as a link
    kOther,    ///< a log of another kind
  };
  Kind kind = Kind::kFile;
  std::string name;     // for people: a path, or "ARCHIVE: MEMBER"
  std::string path;     // of `kFile`
  std::string content;  // of `kContent`
  std::string reason;   // of `kRefused` and `kSkipped`
  std::optional<LogMetadata> metadata;
  bool hasSidecar = false;  // NAME.metadata.plist is beside the file
  bool mayBeLink = false;   // the user has named the file
};

/// Takes what is found, in order. It may wait, and may throw to end the search.
using SourceSink = std::function<void(SourceItem)>;

}  // namespace tavrel::fleet
