// The lock under which one process folds at a time, and what folds have told the log already.
//
// A file that is refused stays where it is, and every fold meets it again. The lock's file, which
// lives until the device restarts, remembers what was told.
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
  /// Waits for another fold, for ten minutes at most. The log must outlive the notes.
  static Expected<FoldNotes> lock(const DeviceRoot& root, FileSystem& files, SystemLog& log);

  /// Writes a line to the log unless it was told before or is one too many. True when it is new, or
  /// when too many were told to know.
  bool tell(std::string_view line);

  /// Marks that a transaction has taken values. Comes before the segments lose them.
  void mark();
  /// The time of the last mark, for who reads the store and then the segments: when it is the same
  /// before and after, no value was missed in between.
  static timespec lastMark(const DeviceRoot& root);

  /// Keeps what was told for the next fold. Says how many lines were one too many.
  void save();

 private:
  FoldNotes(Descriptor file, SystemLog& log);

  Descriptor file_;
  SystemLog& log_;
  std::unordered_set<std::uint64_t> told_;  // the beginnings of SHA-256 digests
  bool hasChanged_ = false;
  std::uint64_t leftOut_ = 0;
};

}  // namespace tavrel
