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
    File,     // the file `path`
    Content,  // the bytes in `content`
    Refused,  // a log that cannot be obtained
    Skipped,  // something that cannot be a log, such as a link
    Other,    // a log of another kind
    TooNew,   // a log whose metadata may still follow
  };
  Kind kind = Kind::File;
  std::string name;     // for people: a path, or "ARCHIVE: MEMBER"
  std::string path;     // of `File`
  std::string content;  // of `Content`
  std::string reason;   // of `Refused` and `Skipped`
  std::optional<LogMetadata> metadata;
  bool hasSidecar = false;  // NAME.metadata.plist is beside the file
  bool mayBeLink = false;   // because the user named the file
};

/// Takes the items in order. It may block, and may throw to end the search.
using SourceSink = std::function<void(SourceItem)>;

}  // namespace tavrel::fleet
