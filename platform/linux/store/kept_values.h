// A file beside the store for scalars that could not be committed, until a commit takes them.
//
// A batch that begins to write takes in the file's values first, and removes the file once they are
// committed. In the same transaction it records in the store's application ID which values it took,
// so that they are not taken twice when a killed process could not remove the file.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <vector>

#include "base/expected.h"
#include "platform/linux/files/file_system.h"

namespace tavrel {

struct KeptValue {
  std::uint32_t number;  // random; the same for all values kept by one call
  std::int32_t day;
  std::int64_t value;
  std::string key;
};

/// Nullopt when the file is damaged.
using KeptContent = std::optional<std::vector<KeptValue>>;

/// Processes that change the file take turns through the lock on the store's folder.
class KeptValues {
 public:
  explicit KeptValues(const std::string& storePath) : path_(storePath + "-kept") {}

  bool exist() const { return FileSystem::status(path_).has_value(); }
  /// In the order in which they were kept; none when there is no file.
  Expected<KeptContent> read();
  /// Adds values durably to those of the file, and gives them their numbers. Drops the earliest
  /// values beyond `limits::kKeptValueBytes` and returns their number. Fails when the file is
  /// damaged or cannot be read.
  Expected<std::size_t> add(std::vector<KeptValue> values);
  void remove() { files_.discard(path_); }
  /// Moves a damaged file to `PATH-damaged`, replacing an earlier one. Returns a line about it, or
  /// an empty string when the file is not damaged.
  std::string setAsideIfDamaged();

 private:
  std::string path_;
  FileSystem files_;
};

}  // namespace tavrel
