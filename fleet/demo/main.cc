// tavrel-fleet-demo DEVICES DAYS FOLDER: writes a simulated fleet's logs as a server receives them.
#include <filesystem>
#include <fstream>
#include <iostream>
#include <random>
#include <stdexcept>
#include <string>
#include <vector>

#include "base/civil_time.h"
#include "base/format.h"
#include "base/parse_number.h"
#include "fleet/demo/simulated_device.h"
#include "platform/tallied_log.h"

namespace {

using namespace tavrel;
using namespace tavrel::fleet;

constexpr std::int32_t kLastDay = 20781;  // 2026-11-24

std::int32_t numberOf(const std::string& text) {
  return parseNumber<std::int32_t>(text).value_or(0);
}

void write(const std::filesystem::path& path, const std::string& content) {
  std::ofstream file(path, std::ios::binary);
  file << content;
  file.close();
  if (!file) throw std::runtime_error("cannot write " + path.string());
}

/// "log-tallied-20261124T060000Z-0000002a", as a device names a log.
std::string nameOf(const SimulatedLog& log, std::size_t number) {
  const CivilTime time = civilFromSeconds(log.filed);
  return format("%s-%04d%02u%02uT%02u%02u%02uZ-%08zx", kTalliedLogName,
                static_cast<int>(time.date.year), time.date.month, time.date.day, time.hour,
                time.minute, time.second, number);
}

void run(std::int32_t devices, std::int32_t days, const std::filesystem::path& folder) {
  std::filesystem::create_directories(folder);
  std::mt19937 random(20781);
  const std::int32_t firstDay = kLastDay - days + 1;
  std::size_t logs = 0;
  for (std::int32_t i = 0; i < devices; ++i) {
    SimulatedDevice device(random, firstDay, days);
    for (std::int32_t day = firstDay; day <= kLastDay; ++day) {
      const auto log = device.live(day);
      if (!log) continue;
      const std::string path = (folder / nameOf(*log, logs++)).string();
      write(std::string(path).append(kLogMetadataEnding), log->metadata);
      write(std::string(path).append(kLogEnding), log->log);
    }
  }
  std::cout << logs << " logs of " << devices << " devices in " << folder.string() << "\n";
}

}  // namespace

int main(int argc, char** argv) {
  const std::vector<std::string> arguments(argv + 1, argv + argc);
  const std::int32_t devices = arguments.size() == 3 ? numberOf(arguments[0]) : 0;
  const std::int32_t days = arguments.size() == 3 ? numberOf(arguments[1]) : 0;
  if (devices < 1 || days < 1 || days > 3650) {
    std::cerr << "usage: tavrel-fleet-demo DEVICES DAYS FOLDER\n";
    return 2;
  }
  try {
    run(devices, days, arguments[2]);
  } catch (const std::exception& error) {
    std::cerr << "tavrel-fleet-demo: " << error.what() << "\n";
    return 1;
  }
}
