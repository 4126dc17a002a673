// Files that wait in the device's folders, and the removal of the oldest of them.
//
// No file is removed for its age, since the clock may be wrong: a device without a battery begins
// in 1970, and a mistyped date may be years ahead. What counts is how many days have files, and how
// many bytes they take. When there are too many, files dated after tomorrow go first, then the
// oldest; so a clock that was wrong for a while costs only the files of that time.
#pragma once

#include <cstdint>
#include <string>
#include <vector>

#include "base/expected.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/limits/device_limits.h"
#include "platform/linux/logs/log_folder.h"

namespace tavrel {

/// The unit of removal: a log with its metadata, or one file.
struct KeptFile {
  std::string path;
  std::string companion;     // removed once the removal of `path` is durable; or empty
  std::int64_t seconds = 0;  // since 1970, from its name or else its last change
  std::int64_t bytes = 0;    // of both, in whole blocks

  std::int64_t day() const;
};

struct KeptUse {
  std::int64_t items = 0;
  std::int64_t days = 0;
  std::int64_t bytes = 0;
};

struct TrimmedFiles {
  std::int64_t removed = 0;
  Status status = Done{};  // the first failure
};

class KeptFiles {
 public:
  /// `kind` is not the store. A missing folder has no files.
  static Expected<KeptFiles> list(Kept kind, const DeviceRoot& root, FileSystem& files,
                                  std::int64_t today);

  /// Keeps programs out that move or remove files of this kind. Hold it from `list` to the end of
  /// `trim`. Empty for kinds and folders without a lock.
  static Expected<Descriptor> lock(Kept kind, const DeviceRoot& root, FileSystem& files);

  KeptUse use() const;

  /// Removes what exceeds the bounds, first files that exceed them by themselves. In place of a
  /// file that cannot be removed, the next ones go. The newest log, the records of `today`, and
  /// what was set aside or last changed today or yesterday always stay, and do not count when they
  /// alone exceed the bound. Also removes metadata that a killed process left without its log.
  TrimmedFiles trim(const Bounds& bounds);

 private:
  KeptFiles(Kept kind, FileSystem& files, std::int64_t today)
      : kind_(kind), fileSystem_(files), today_(today) {}

  Status listLogs(const LogFolder& folder);
  Status listRecords();
  Status listEvents();
  Status listSetAside(const std::string& folder);
  void add(const std::string& path, std::int64_t seconds);
  /// The files from here on always stay.
  std::vector<KeptFile>::iterator beginOfStaying();
  Status removeCompanions(const std::vector<std::string>& companions);

  Kept kind_;
  FileSystem& fileSystem_;
  std::int64_t today_;
  std::string folder_;
  std::vector<KeptFile> list_;        // in order of removal
  std::vector<std::string> orphans_;  // paths of metadata without its log
};

}  // namespace tavrel
