// The folder in which programs leave their segments. Any user of its group can create files there,
// so nothing about an entry is trusted, neither its name nor its kind.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <vector>

#include "base/expected.h"
#include "base/limits.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/device_root.h"

namespace tavrel {

inline constexpr std::string_view kSegmentFolder = "/run/tavrel/stat";

/// A file in the folder that looks like a segment, not opened yet.
struct SegmentEntry {
  std::string name;
  std::uint32_t owner = 0;
};

/// A segment that is open for reading.
struct OpenSegment {
  SegmentEntry entry;
  Descriptor file;
  dev_t device = 0;
  ino_t inode = 0;
};

/// The result of opening a segment; both members are empty when it has gone.
struct SegmentOpening {
  std::optional<OpenSegment> segment;
  std::string refusal;  // why it was refused, a line for people
};

class SegmentFolder {
 public:
  /// Nothing when the device has no folder. An error when it is not on a tmpfs.
  static Expected<std::optional<SegmentFolder>> open(const DeviceRoot& root);
  /// Whether `open` fails because this user may not read the folder, or because nothing in it is
  /// ever folded.
  static bool isOutOfReach(const DeviceRoot& root);

  const std::string& path() const { return path_; }

  struct Listing {
    std::vector<SegmentEntry> segments;  // by name: those that began earlier come first
    /// Segments that were left out, by owner. When there are too many, a random choice is listed,
    /// so that each gets its turn.
    std::map<std::uint32_t, std::uint64_t> leftOut;
    /// Owners of files that are refused only while they have several names (hard links).
    std::set<std::uint32_t> linked;
    std::vector<std::string> refusals;  // lines for people
    bool isWhole = true;                // every entry of the folder was seen
  };
  /// At most `limits::kSegmentsPerUser` of each owner, `limits::kSegments` in all, out of the first
  /// `mostFiles`.
  Expected<Listing> list(std::size_t mostFiles = limits::kSegmentFolderEntries) const;

  /// Opens a segment for reading. An error means that the system cannot do so now; it says nothing
  /// about the segment.
  Expected<SegmentOpening> openSegment(const SegmentEntry& entry) const;
  /// Opens the same file for writing.
  Descriptor openToAcknowledge(const OpenSegment& segment) const;
  /// Removes the name, unless it belongs to another file by now.
  bool remove(const OpenSegment& segment) const;

  static constexpr std::string_view kRemoveIt = "remove it";
  /// A line for people about a refused file: why, and what to do.
  std::string refusal(std::string_view name, std::string_view reason,
                      std::string_view advice = kRemoveIt) const;

  /// Withdraws the request for a fold.
  Status clearRequest() const;

 private:
  SegmentFolder(std::string path, Descriptor folder, dev_t device)
      : path_(std::move(path)), folder_(std::move(folder)), device_(device) {}

  std::string path_;
  Descriptor folder_;
  dev_t device_;
};

}  // namespace tavrel
