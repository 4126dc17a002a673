// The statistics store of a device, read without a fold: the values that wait for one belong to it.
#pragma once

#include <memory>
#include <string>
#include <vector>

#include "platform/forwarding_store.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/folding/segment_folder.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel {

/// Shows what `FoldingStore` shows after a checkpoint, and changes no segment. Its histories have
/// the order of `BHHistory` only within each day.
class UnfoldedStore final : public ForwardingStore {
 public:
  /// All must outlive it.
  UnfoldedStore(const DeviceRoot& root, SqliteStore& store, FileSystem& files,
                PropertyListCoding& propertyLists, SystemLog& log)
      : ForwardingStore(store),
        root_(root),
        store_(store),
        files_(files),
        propertyLists_(propertyLists),
        log_(log) {}

  /// Which waiting values the last history lacked, for people, in a line each.
  const std::vector<std::string>& missing() const { return missing_; }

  /// Must not outlive the store.
  std::unique_ptr<BHHistory> initWithDefaultPath() override;

 private:
  class History;
  void noteSegmentsOfOthers(const std::vector<SegmentEntry>& segments);

  const DeviceRoot& root_;
  SqliteStore& store_;
  FileSystem& files_;
  PropertyListCoding& propertyLists_;
  SystemLog& log_;
  std::vector<std::string> missing_;
};

}  // namespace tavrel
