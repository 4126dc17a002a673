// The folder of recordings, /var/lib/tavrel/registry under the device root.
#pragma once

#include <ctime>
#include <string>
#include <string_view>
#include <sys/types.h>
#include <vector>

#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/recorded/recording.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel {

inline constexpr std::string_view kRecordingFolder = "/var/lib/tavrel/registry";

class RecordingFolder {
 public:
  RecordingFolder(const DeviceRoot& root, FileSystem& files, PropertyListCoding& propertyLists,
                  SystemLog& log)
      : root_(root), files_(files), propertyLists_(propertyLists), log_(log) {}

  /// Updates `parts` from the "*.plist" files of the folder, in the order of their names. Reads
  /// only files that were replaced or changed. Returns whether there were any.
  bool update(std::vector<RecordingPart>& parts);

 private:
  /// Distinguishes versions of a file.
  struct Stamp {
    std::string path;
    dev_t device;
    ino_t inode;
    off_t size;
    std::time_t seconds;
    long nanoseconds;
    bool operator==(const Stamp&) const = default;
  };

  std::vector<Stamp> stampFiles();

  const DeviceRoot& root_;
  FileSystem& files_;
  PropertyListCoding& propertyLists_;
  SystemLog& log_;
  std::vector<Stamp> stamps_;  // one for each part
  std::string complaint_;      // the last one logged, so that updates do not repeat it
};

}  // namespace tavrel
