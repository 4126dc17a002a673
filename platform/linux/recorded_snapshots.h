// Stack snapshots played back from /var/lib/tavrel/registry/stack-snapshot.bin under the device
// root: the bytes of one snapshot in the kernel's key-coded data format.
#pragma once

#include "platform/linux/device_root.h"
#include "platform/linux/file_layer.h"
#include "platform/stack_snapshot.h"

namespace tavrel {

class RecordedSnapshots final : public StackSnapshots {
 public:
  RecordedSnapshots(const DeviceRoot& root, FileLayer& files) : root_(root), files_(files) {}

  std::unique_ptr<StackSnapshot> create() override;

 private:
  const DeviceRoot& root_;
  FileLayer& files_;
};

}  // namespace tavrel
