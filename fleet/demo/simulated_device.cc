#include "fleet/demo/simulated_device.h"

#include <algorithm>
#include <array>
#include <cmath>

#include "platform/tallied_log.h"
#include "report/bh_report.h"

namespace tavrel::fleet {

namespace {

using plist::Array;
using plist::Dictionary;

constexpr const char* kLaunch = "com.example.launch.milliseconds";
constexpr const char* kMemory = "com.norvane.usage.memory.used_percent";
constexpr const char* kLoad = "com.norvane.usage.load.one_minute";
constexpr const char* kTemperature = "com.norvane.usage.temperature.celsius";
constexpr const char* kUsed = "com.norvane.ioreport.nvme0.used_pct";
constexpr const char* kAmplification = "com.norvane.ioreport.nvme0.waf_milli";

struct Region {
  const char* country;
  const char* language;
  double share;
};
constexpr std::array kRegions = {Region{"DE", "de", 0.38}, Region{"US", "en", 0.25},
                                 Region{"FR", "fr", 0.17}, Region{"JP", "ja", 0.12},
                                 Region{"AT", "de", 0.07}, Region{"LI", "de", 0.01}};

const Region& regionAt(double share) {
  for (const Region& region : kRegions) {
    if (share < region.share) return region;
    share -= region.share;
  }
  return kRegions.front();
}

/// The new version has its own whitelist, with one more boundary for the launches.
Dictionary whitelist(bool isNew) {
  const Dictionary rounded{{"sig_fig", 2}};
  const Array launches = isNew ? Array{50, 100, 150, 200, 300, 400, 800, 1600}
                               : Array{50, 100, 200, 300, 400, 800, 1600};
  return {
      {"Fleet",
       Dictionary{{"ScalarKeys",
                   Dictionary{{kUsed, Dictionary{{"bucket_interval", 5}}},
                              {kAmplification, rounded},
                              {"com.norvane.usage.cpu.busy_milliseconds", rounded},
                              {"com.norvane.usage.disk.free_mib", rounded},
                              {"com.norvane.usage.disk.written_kib", rounded},
                              {"com.norvane.usage.network.received_kib", rounded},
                              {"com.norvane.usage.processes", Dictionary{{"bucket_interval", 10}}},
                              {"com.norvane.usage.uptime.seconds", rounded},
                              {"com.example.launches", rounded},
                              {"com.norvane.lumenhall.numAllInstalledApps", rounded}}},
                  {"DistributionKeys",
                   Dictionary{{kLaunch, Dictionary{{"intervals", launches}}},
                              {kMemory, Dictionary{{"intervals", Array{25, 50, 60, 70, 80, 90}}}},
                              {kTemperature, Dictionary{{"intervals", Array{30, 35, 40, 45, 50}}}},
                              {kLoad, Dictionary::create()}}}}}};
}

}  // namespace

SimulatedDevice::SimulatedDevice(std::mt19937& random, std::int32_t firstDay, std::int32_t days)
    : random_(random) {
  std::uniform_real_distribution<double> share(0, 1);
  platform_.platform.digest = digest_;
  const Region& region = regionAt(share(random));
  platform_.locale.country = region.country;
  platform_.locale.preferred = {region.language};
  platform_.locale.matched = {region.language};

  // Three in four devices get the new version, after the first third of the days.
  const std::int32_t wait = days / 3;
  updateDay_ = share(random) < 0.75
                   ? firstDay + wait + static_cast<std::int32_t>(share(random) * (days - wait))
                   : firstDay + days;
  slowness_ = std::exp(normal(0, 0.2));
  usedPercent_ = share(random) < 0.6 ? share(random) * 10 : 30 + share(random) * 65;
  freeMebibytes_ = around(40'000, 15'000);
  platform_.applications.bundles.assign(static_cast<std::size_t>(around(60, 20)),
                                        PWBundleProxy("com.example.app", "User"));
  useVersion(firstDay);
}

double SimulatedDevice::normal(double mean, double deviation) {
  return std::normal_distribution<double>(mean, deviation)(random_);
}

double SimulatedDevice::around(double middle, double spread) {
  return std::max(0.0, normal(middle, spread));
}

void SimulatedDevice::useVersion(std::int32_t day) {
  isNew_ = day >= updateDay_;
  platform_.submission.osVersion = isNew_ ? kNewVersion : kOldVersion;
  platform_.setWhitelist(whitelist(isNew_));
}

void SimulatedDevice::record(std::int32_t day) {
  fakes::FakeStore& store = platform_.store;
  store.scalars.clear();
  store.distributions.clear();
  const auto scalar = [&](const char* key, double value) {
    store.scalars.emplace_back(key, day, std::llround(value));
  };
  const auto series = [&](const char* key, double count, const auto& next) {
    std::vector<double> values(static_cast<std::size_t>(std::max(std::ceil(count), 0.0)));
    std::ranges::generate(values, next);
    store.distributions.emplace_back(key, day, std::move(values));
  };

  const bool isWorn = usedPercent_ > 70;
  const double launches = std::floor(1 + around(20, 8));
  const double launch = 170 * slowness_ * (isWorn ? 1.2 : 1) * (isNew_ ? 1.2 : 1);
  series(kLaunch, launches, [&] { return launch * std::exp(normal(0, 0.35)); });
  const double memory = std::clamp(normal(62, 9), 15.0, 92.0);
  series(kMemory, 24, [&] { return std::clamp(normal(memory, 4), 5.0, 99.0); });
  const double temperature = normal(38, 3);
  series(kTemperature, 24, [&] { return normal(temperature, 1.5); });
  series(kLoad, 24, [&] { return around(0.8 * slowness_, 0.3); });

  const double written = around(900'000, 250'000);
  usedPercent_ += written * 4e-8;
  scalar(kUsed, usedPercent_);
  scalar(kAmplification, around(isWorn ? 2600 : 1700, 200));
  scalar("com.norvane.usage.cpu.busy_milliseconds", around(5'400'000 * slowness_, 700'000));
  scalar("com.norvane.usage.disk.free_mib", around(freeMebibytes_, 300));
  scalar("com.norvane.usage.disk.written_kib", written);
  scalar("com.norvane.usage.network.received_kib", around(240'000, 90'000));
  scalar("com.norvane.usage.processes", around(140, 15));
  scalar("com.norvane.usage.uptime.seconds", around(400'000, 150'000));
  scalar("com.example.launches", launches);
}

std::optional<SimulatedLog> SimulatedDevice::live(std::int32_t day) {
  constexpr double kOnShare = 0.92;
  const std::int64_t filed =
      (static_cast<std::int64_t>(day) + 1) * 86'400 + std::lround(around(25'000, 6'000));
  const bool isOn = std::uniform_real_distribution<double>(0, 1)(random_) < kOnShare;
  useVersion(day);
  record(day);
  if (!isOn) return std::nullopt;

  platform_.clock.instant = plist::Date::since1970(static_cast<double>(filed));
  BHReport(platform_.platform).writeLogForYesterday(day, {});
  platform_.journal.clear();
  platform_.log.entries.clear();
  fakes::FakeSubmission::Log log = std::move(platform_.submission.logs.back());
  platform_.submission.logs.clear();

  Dictionary metadata{{kLogMetadataType, log.type},
                      {kLogMetadataName, log.name},
                      {kLogMetadataVersion, platform_.submission.osVersion},
                      {kLogMetadataTime, platform_.clock.instant}};
  if (log.options && !log.options.empty()) metadata.set(kLogMetadataOptions, log.options);
  return SimulatedLog{std::move(log.content), *platform_.propertyLists.encodeXml(metadata), filed};
}

}  // namespace tavrel::fleet
