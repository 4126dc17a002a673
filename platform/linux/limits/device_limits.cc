#include "platform/linux/limits/device_limits.h"

#include <algorithm>
#include <string>
#include <unistd.h>

#include "base/format.h"
#include "base/limits.h"
#include "base/text.h"
#include "platform/linux/files/property_list_file.h"

namespace tavrel {
namespace {

constexpr std::string_view kDaysKey = "Days";
constexpr std::string_view kBytesKey = "Bytes";

struct Range {
  std::int64_t lowest;
  std::int64_t highest;
};
constexpr Range kDays{1, 36'500};
// A day's log with its metadata takes two blocks of 4 KiB.
constexpr Range kBytes{64 << 10, std::int64_t{1} << 40};

// The beginning of a long name is enough.
std::string shown(std::string_view name) {
  return quotedText(name.substr(0, 60));
}

std::string kindNames() {
  std::string names;
  for (const KeptKind& kind : kKeptKinds)
    names.append(names.empty() ? "" : ", ").append(kind.name);
  return names;
}

Status applyBound(std::int64_t& bound, const plist::Value& value, Range range,
                  const std::string& place) {
  const auto number = value.number();
  // An integer above 2^63-1 reads as negative.
  if (!number || number->isFloating() || number->int64() < range.lowest ||
      number->int64() > range.highest) {
    return Error{
        format("%s must be an integer from %lld to %lld", place, range.lowest, range.highest)};
  }
  bound = number->int64();
  return Done{};
}

}  // namespace

DeviceLimits::DeviceLimits() {
  for (const KeptKind& kind : kKeptKinds)
    bounds_[static_cast<std::size_t>(kind.kind)] = kind.bounds;
}

Expected<DeviceLimits> DeviceLimits::read(const DeviceRoot& root, FileSystem& files,
                                          PropertyListCoding& propertyLists) {
  DeviceLimits limits;
  const std::string path = root.path(kLimitsPath);
  const auto refuse = [&](std::string_view fault) {
    return Error{format("%s: %s: nothing is removed until it is repaired", path, fault)};
  };
  const auto bytes = files.readIfPresent(path, limits::kSystemFactBytes);
  if (!bytes) return Error{bytes.error().message + ": nothing is removed"};
  if (!*bytes) {
    if (const auto reason = reasonToMiss(path); !reason.empty()) return refuse(reason);
    return limits;
  }
  if (const auto reason = reasonToDistrust(path); !reason.empty()) return refuse(reason);
  const auto value = propertyLists.decode(asBytes(**bytes));
  if (!value) return refuse(value.error().message);
  if (!value->dictionary()) return refuse("it is not a dictionary");
  if (Status applied = limits.apply(value->dictionary()); !applied) {
    return refuse(applied.error().message);
  }
  return limits;
}

Status DeviceLimits::apply(const plist::Dictionary& content) {
  for (const plist::Entry& entry : content) {
    const auto kind = std::ranges::find_if(
        kKeptKinds, [&](const KeptKind& known) { return entry.key == known.name; });
    if (kind == kKeptKinds.end()) {
      return Error{format("%s is not a limit; they are %s", shown(entry.key), kindNames())};
    }
    const plist::Dictionary given = entry.value.dictionary();
    if (!given) return Error{format("%s must be a dictionary", kind->name)};
    Bounds& bounds = bounds_[static_cast<std::size_t>(kind->kind)];
    for (const plist::Entry& bound : given) {
      const std::string place = std::string(kind->name) + "/" + std::string(bound.key.view());
      const bool isDays = bound.key == kDaysKey && kind->bounds.days != kAnyDays;
      if (!isDays && bound.key != kBytesKey) {
        return Error{format("%s has no limit %s; it has %s", kind->name, shown(bound.key),
                            kind->bounds.days == kAnyDays ? "Bytes" : "Days and Bytes")};
      }
      const Status applied = isDays ? applyBound(bounds.days, bound.value, kDays, place)
                                    : applyBound(bounds.bytes, bound.value, kBytes, place);
      if (!applied) return applied;
    }
  }
  return Done{};
}

}  // namespace tavrel
