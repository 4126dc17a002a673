// The lock under which one process folds at a time, and the refusals that folds have logged
// already.
//
// A refused file stays where it is, so every fold meets it again. The lock file, which lives until
// the device restarts, remembers which lines were logged, and how many refusals await being counted
// in the store.
#pragma once

#include <cstdint>
#include <ctime>
#include <string>
#include <string_view>
#include <unordered_set>

#include "base/expected.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/system_log.h"

namespace tavrel {

class FoldNotes {
 public:
  /// Waits at most ten minutes for another fold to end. The log must outlive the notes.
  static Expected<FoldNotes> lock(const DeviceRoot& root, FileSystem& files, SystemLog& log);

  /// Logs a line, unless it was seen before or is one too many. True when it is new, or when too
  /// many are remembered to know.
  bool logOnce(std::string_view line);

  /// The same about a refused file, which is counted when `logOnce` is true.
  void refuse(std::string_view line);
  /// Refused files that no store counts yet, with those of earlier folds, which failed.
  std::uint64_t uncountedFiles() const { return uncountedFiles_; }
  /// Values that folds have refused, and that no store counts yet.
  std::uint64_t uncountedValues() const { return uncountedValues_; }
  void addUncountedValues(std::uint64_t count);
  /// After the commit that counts files and values.
  void clearUncounted();

  /// Marks that a transaction has taken values. Call it before the segments lose them.
  void mark();
  /// The time of the last mark, for readers of the store and then the segments: when it is the same
  /// before and after, they missed no value in between.
  static timespec lastMark(const DeviceRoot& root);

  /// Saves which lines were seen, for the next fold. Logs how many were too many to list.
  void save();

 private:
  FoldNotes(Descriptor file, std::string path, SystemLog& log);

  Descriptor file_;
  std::string path_;  // for messages
  SystemLog& log_;
  std::unordered_set<std::uint64_t> logged_;  // first 8 bytes of the lines' SHA-256
  std::uint64_t uncountedFiles_ = 0;
  std::uint64_t uncountedValues_ = 0;
  bool hasChanged_ = false;
  std::uint64_t leftOut_ = 0;
};

}  // namespace tavrel
