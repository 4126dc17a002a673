// A folder for copies of refused logs, each with its reason beside it.
#pragma once

#include <string>

#include "base/expected.h"
#include "fleet/sources/source_item.h"
#include "platform/linux/files/file_system.h"

namespace tavrel::fleet {

class SetAside {
 public:
  /// The folder is made when it is needed.
  explicit SetAside(std::string folder) : folder_(std::move(folder)) {}

  /// Writes the bytes of a refused log as DIGITS-NAME, and where it was and the reason as
  /// DIGITS-NAME.reason. The digits are those of the bytes' SHA-256, so that the same log has the
  /// same name each time. Of what cannot be read only the reason is written.
  Status keep(const SourceItem& refused);

 private:
  std::string folder_;
  FileSystem files_;
};

}  // namespace tavrel::fleet
