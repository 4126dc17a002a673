// An item that a search for logs found: a log still to be read, or why something is not read.
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
    kRefused,  ///< a log that cannot be obtained
    kSkipped,  ///< something that cannot be a log, such as a link
    kOther,    ///< a log of another kind
    kTooNew,   ///< a log whose metadata may still follow
  };
  Kind kind = Kind::kFile;
  std::string name;     // for people: a path, or "ARCHIVE: MEMBER"
  std::string path;     // of `kFile`
  std::string content;  // of `kContent`
  std::string reason;   // of `kRefused` and `kSkipped`
  std::optional<LogMetadata> metadata;
  bool hasSidecar = false;  // NAME.metadata.plist is beside the file
  bool mayBeLink = false;   // because the user named the file
};

/// Takes the items in order. It may block, and may throw to end the search.
using SourceSink = std::function<void(SourceItem)>;

}  // namespace tavrel::fleet
