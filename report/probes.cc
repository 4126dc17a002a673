// The probes of the report: the daemon's own measurements when a log is serialised.
#include <array>
#include <string>
#include <vector>

#include "base/arithmetic.h"
#include "base/bytes.h"
#include "base/format.h"
#include "platform/statistics_store.h"
#include "platform/store_path.h"
#include "platform/tallied_log.h"
#include "report/bh_report.h"
#include "report/faultline_preferences.h"

namespace tavrel {
namespace {

constexpr std::string_view kAllAppsKey = "com.norvane.lumenhall.numAllInstalledApps";
constexpr std::string_view kUserAppsKey = "com.norvane.lumenhall.numThirdPartyApps";
constexpr std::string_view kDatabaseSizeKey = "com.norvane.zentrix.bhd.database.size";
constexpr std::string_view kCorruptionsKey = "com.norvane.zentrix.bhd.database.corruptions";
constexpr std::string_view kUptimeKey = "com.norvane.usage.cur_boot_session_cpu_uptime";

constexpr std::int64_t kBytesPerMiB = 1048576;

/// A scalar that is read from a system control: its name, the length of its value in bytes (the
/// first eight hold the reported number), and the value reported when it cannot be read.
struct VMControl {
  std::string_view key;
  std::string_view control;
  std::size_t length;
  std::int64_t failure;
};

constexpr VMControl kVMControls[] = {
    {"com.norvane.kernel.memorystatus_freeze_count", "kern.memorystatus_freeze_count", 4,
     4294967295},
    {"com.norvane.kernel.memorystatus_freeze_pageouts", "kern.memorystatus_freeze_pageouts", 8, -1},
    {"com.norvane.kernel.memorystatus_freeze_budget_pages_remaining",
     "kern.memorystatus_freeze_budget_pages_remaining", 8, -1},
    {"com.norvane.kernel.memorystatus_thaw_count", "kern.memorystatus_thaw_count", 4, 4294967295},
    {"com.norvane.kernel.swapusage", "vm.swapusage", 32, -1},
};

std::string firstOrUnknown(const std::vector<std::string>& languages) {
  return languages.empty() ? std::string(kUnknownText) : languages.front();
}

std::int64_t readControl(SystemControls& controls, const VMControl& control) {
  std::array<std::byte, 32> buffer{};
  const MutableByteSpan value = MutableByteSpan(buffer).first(control.length);
  if (controls.read(control.control, value).errorNumber != 0) return control.failure;
  // The zeros after a four-byte value extend it.
  return static_cast<std::int64_t>(*loadLittle64(buffer, 0));
}

}  // namespace

void BHReport::addInstalledAppInfo() {
  const plist::Dictionary allOptions = optionsForScalar(kAllAppsKey);
  const plist::Dictionary userOptions = optionsForScalar(kUserAppsKey);
  if (!allOptions && !userOptions) return;

  std::int64_t all = 0;
  std::int64_t user = 0;
  platform_.applications->enumerateBundles(kInstalledApplications,
                                           [&](const PWBundleProxy& bundle) {
                                             ++all;
                                             if (bundle.bundleType() == PWUserApplicationType)
                                               ++user;
                                           });
  if (allOptions) addScalar(all, kAllAppsKey, allOptions);
  if (userOptions) addScalar(user, kUserAppsKey, userOptions);
}

void BHReport::addMetadataKeys() {
  Locale& locale = platform_.locale;
  const std::vector<std::string> preferred = locale.preferredLanguages();
  _metadataOutput.set(
      kLanguageKey, firstOrUnknown(locale.matchLocalizations(locale.systemLanguages(), preferred)));
  _metadataOutput.set(kPreferredLanguageKey, firstOrUnknown(preferred));
  if (const auto country = locale.countryCode()) {
    _metadataOutput.set(kRegionKey, *country);
  }
}

void BHReport::reportDatabaseSize() {
  addScalarForKey(kDatabaseSizeKey, [this]() -> std::int64_t {
    const auto bytes = platform_.files->size(kStorePath);
    return bytes ? *bytes / kBytesPerMiB : -1;
  });
  addScalarForKey(kCorruptionsKey, [this] { return takeCorruptionCount(); });
}

// Reads and resets the count. The preference is written at the next synchronisation of its domain,
// at the latest when the process ends.
std::int64_t BHReport::takeCorruptionCount() {
  if (!findFaultlinePreferences(platform_)) return 0;
  const ProcessState& state = platform_.state;
  const std::int32_t count =
      lowInt32(state.integerPreferenceGetter(kStoreCorruptionsKey, kStoreCorruptionsDomain));
  state.preferenceSetter(kStoreCorruptionsKey, 0, kStoreCorruptionsDomain);
  return count;
}

void BHReport::reportCPUUptime() {
  addScalarForKey(kUptimeKey, [this]() -> std::int64_t {
    const std::uint64_t ticks = platform_.clock->ticks();
    const auto base = platform_.clock->timeBase();
    if (!base || base->denominator == 0) {
      platform_.log->log(LogLevel::Error, "Couldn't retrieve mach_timebase_info");
      return -1;
    }
    const double minutesPerTick = base->numerator * 1e-9 / base->denominator / 60;
    return saturatingInt64(minutesPerTick * static_cast<double>(ticks));
  });
}

void BHReport::reportVMStats() {
  for (const VMControl& control : kVMControls) {
    addScalarForKey(control.key, [&] { return readControl(platform_.systemControls, control); });
  }
}

}  // namespace tavrel
