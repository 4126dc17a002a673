// Moves recorded values from programs' segments into the statistics store, exactly once.
//
//   SegmentFold fold(root, store, files, propertyLists, log);
//   const FoldReport report = fold.run();
//
// The transaction that takes the values of a segment also keeps how far it was read. Only then is
// the space given back to the program, or the segment removed when no program can write to it any
// more. When a process is killed at any point, the next fold completes its work.
#pragma once

#include <cstdint>
#include <optional>
#include <string>

#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel {

/// What a fold did. It counts only what the store has taken for good.
struct FoldReport {
  bool hasFolder = false;
  std::uint64_t segments = 0;          // read
  std::uint64_t scalars = 0;           // changes of scalars
  std::uint64_t values = 0;            // measurements
  std::uint64_t removed = 0;           // segments that nobody will write to any more
  std::uint64_t waiting = 0;           // segments left for the next fold
  std::uint64_t withoutRights = 0;     // those of them whose users' rights are unknown
  std::uint64_t dropped = 0;           // values for which the programs had no room
  std::uint64_t refused = 0;           // values that were not taken
  std::uint64_t segmentsRefused = 0;   // files refused for the first time
  std::optional<std::string> failure;  // why it did not take everything; the rest waits
};

class SegmentFold {
 public:
  /// All must outlive it.
  SegmentFold(const DeviceRoot& root, SqliteStore& store, FileSystem& files,
              PropertyListCoding& propertyLists, SystemLog& log)
      : root_(root), store_(store), files_(files), propertyLists_(propertyLists), log_(log) {}

  /// Costs one system call where there is no folder. Refusals are lines in the log; a failure is
  /// only in the report.
  FoldReport run();

 private:
  const DeviceRoot& root_;
  SqliteStore& store_;
  FileSystem& files_;
  PropertyListCoding& propertyLists_;
  SystemLog& log_;
};

}  // namespace tavrel
