// A device that exists only in memory and reports with the daemon's own code.
#pragma once

#include <cstdint>
#include <random>
#include <string>

#include "platform/linux/files/digests.h"
#include "tests/fakes/fake_platform.h"

namespace tavrel::fleet {

inline constexpr const char* kOldVersion = "Pellio 4.1 (16Q210)";
/// Programs take a fifth longer to start in this version.
inline constexpr const char* kNewVersion = "Pellio 4.2 (16R349)";

struct SimulatedLog {
  std::string log;
  std::string metadata;
  std::int64_t filed = 0;  // seconds since 1970 UTC
};

class SimulatedDevice {
 public:
  /// The simulation covers `days` days from `firstDay`. On one of them most devices
  /// switch to the new version.
  SimulatedDevice(std::mt19937& random, std::int32_t firstDay, std::int32_t days);

  /// Nothing on a day when the device is off.
  std::optional<SimulatedLog> live(std::int32_t day);

 private:
  double normal(double mean, double deviation);
  double around(double middle, double spread);  // never negative
  void useVersion(std::int32_t day);
  void record(std::int32_t day);

  std::mt19937& random_;
  fakes::FakePlatform platform_;
  LinuxDigest digest_;
  bool isNew_ = false;
  std::int32_t updateDay_ = 0;
  double slowness_ = 1;     // relative to other devices
  double usedPercent_ = 0;  // of the flash's rated life, when the simulation begins
  double freeMebibytes_ = 0;
};

}  // namespace tavrel::fleet
