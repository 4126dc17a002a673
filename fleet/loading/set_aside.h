// A folder for copies of refused logs, each with its reason beside it.
#pragma once

#include <string>

#include "base/bytes.h"
#include "base/expected.h"
#include "fleet/sources/source_item.h"
#include "platform/linux/files/file_system.h"

namespace tavrel::fleet {

class SetAside {
 public:
  /// Makes the folder only when it is needed.
  explicit SetAside(std::string folder) : folder_(std::move(folder)) {}

  /// Writes the bytes of a refused log to DIGITS-NAME, and its origin and the reason to
  /// DIGITS-NAME.reason. The digits come from the SHA-256 of the bytes, so the same log always gets
  /// the same name. For a log that cannot be read, only the reason is written.
  Status keep(const SourceItem& refused);

 private:
  /// Leaves a file alone that already has these bytes: each load refuses the same logs again.
  Status write(const std::string& path, ByteSpan bytes);

  std::string folder_;
  FileSystem files_;
};

}  // namespace tavrel::fleet
