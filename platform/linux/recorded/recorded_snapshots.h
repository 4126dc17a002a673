// Stack snapshots played back from /var/lib/tavrel/registry/stack-snapshot.bin under the device
// root: the bytes of one snapshot in the kernel's key-coded data format. Capturing fails without
// the file and, with a line in the system log, when the file cannot be read.
#pragma once

#include <string_view>

#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/stack_snapshot.h"
#include "platform/system_log.h"

namespace tavrel {

inline constexpr std::string_view kRecordedSnapshot = "/var/lib/tavrel/registry/stack-snapshot.bin";

class RecordedSnapshots final : public StackSnapshots {
 public:
  RecordedSnapshots(const DeviceRoot& root, FileSystem& files, SystemLog& log)
      : root_(root), files_(files), log_(log) {}

  std::unique_ptr<StackSnapshot> create() override;

 private:
  const DeviceRoot& root_;
  FileSystem& files_;
  SystemLog& log_;
};

}  // namespace tavrel
