// How much of the device's storage each kind of content may use.
//
// /etc/tavrel/limits.plist has a dictionary for each kind whose bounds it changes:
//
//   {"Store": {"Days": 365, "Bytes": 67108864}, "Outbox": {"Bytes": 1048576}}
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <string_view>

#include "base/expected.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/logs/file_crash_reporting.h"
#include "platform/linux/logs/log_folder.h"
#include "platform/property_list_coding.h"

namespace tavrel {

inline constexpr std::string_view kLimitsPath = "/etc/tavrel/limits.plist";

/// The kinds of content that take storage. The values are indices into `kKeptKinds`.
enum class Kept : std::uint8_t {
  Store,
  Pending,
  Outbox,
  Withheld,
  Refused,
  Records,
  EccEvents,
  SetAside,
};

struct Bounds {
  std::int64_t days = 0;   // number of days with content, whatever their dates
  std::int64_t bytes = 0;  // of files, in whole blocks; of the store, pages in use
};

inline constexpr std::int64_t kAnyDays = std::numeric_limits<std::int64_t>::max();

struct KeptKind {
  Kept kind;
  std::string_view name;       // key in the limits file
  std::string_view label;      // for people
  std::string_view item;       // the unit of removal, for people
  std::string_view statistic;  // counts removals
  Bounds bounds;               // default
};

inline constexpr std::int64_t kMebibyte = 1 << 20;

/// The bounds are for a device with 64 MB to spare; docs/limits.md has the sum.
inline constexpr std::array kKeptKinds = {
    KeptKind{Kept::Store,
             "Store",
             "statistics store",
             "day",
             "com.norvane.tavrel.limits.store.days",
             {90, 12 * kMebibyte}},
    KeptKind{Kept::Pending,
             "Pending",
             "pending logs",
             "log",
             "com.norvane.tavrel.limits.pending.logs",
             {60, 2 * kMebibyte}},
    KeptKind{Kept::Outbox,
             "Outbox",
             "logs in the outbox",
             "log",
             "com.norvane.tavrel.limits.outbox.logs",
             {60, 4 * kMebibyte}},
    KeptKind{Kept::Withheld,
             "Withheld",
             "withheld logs",
             "log",
             "com.norvane.tavrel.limits.withheld.logs",
             {kWithheldLogs, kMebibyte}},
    KeptKind{Kept::Refused,
             "Refused",
             "refused logs",
             "log",
             "com.norvane.tavrel.limits.refused.logs",
             {60, kMebibyte}},
    KeptKind{Kept::Records,
             "Records",
             "structured records",
             "file",
             "com.norvane.tavrel.limits.records.files",
             {FileCrashReporting::kDaysKept, 2 * kMebibyte}},
    KeptKind{Kept::EccEvents,
             "EccEvents",
             "memory errors",
             "file",
             "com.norvane.tavrel.limits.ecc_events.files",
             {kAnyDays, kMebibyte}},
    KeptKind{Kept::SetAside,
             "SetAside",
             "files set aside as damaged",
             "file",
             "com.norvane.tavrel.limits.set_aside.files",
             {kAnyDays, 16 * kMebibyte}},
};

class DeviceLimits {
 public:
  /// The bounds in force. Fails, with a line that names the first fault, when the file is not
  /// exactly as described: what its author meant to keep must not be removed by a default.
  static Expected<DeviceLimits> read(const DeviceRoot& root, FileSystem& files,
                                     PropertyListCoding& propertyLists);

  const Bounds& of(Kept kind) const { return bounds_[static_cast<std::size_t>(kind)]; }

 private:
  DeviceLimits();
  Status apply(const plist::Dictionary& content);

  std::array<Bounds, kKeptKinds.size()> bounds_;
};

}  // namespace tavrel
