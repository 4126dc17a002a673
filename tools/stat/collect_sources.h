// The state of the machine in /proc and /sys.
//
// A figure that could not be read is nothing, never 0.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <optional>
#include <string>
#include <string_view>

#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/device_root.h"

namespace tavrel {

/// Counters count since the machine started; a removed device takes its part with it.
struct MachineReading {
  std::optional<double> uptimeSeconds;
  std::optional<double> loadOfOneMinute;
  std::optional<std::uint64_t> processes;

  /// Clock ticks of all CPUs together.
  struct CpuTicks {
    std::uint64_t busy;
    std::uint64_t total;
  };
  std::optional<CpuTicks> cpu;
  std::uint64_t cpus = 0;

  std::optional<std::uint64_t> memoryTotalKib;
  std::optional<std::uint64_t> memoryAvailableKib;
  std::optional<std::uint64_t> swapUsedKib;

  /// Bytes over all network interfaces except the loopback.
  struct Traffic {
    std::uint64_t in;
    std::uint64_t out;
  };
  std::optional<Traffic> network;
  /// Bytes of all disks with a device of their own, without loop devices, mappings and memory.
  std::optional<Traffic> disk;

  /// The hottest thermal zone.
  std::optional<double> celsius;

  /// The file system that holds the device's data folder.
  std::optional<std::uint64_t> diskTotalMib;
  std::optional<std::uint64_t> diskFreeMib;
};

/// Counting processes takes the kernel longer than all the rest.
enum class Processes : std::uint8_t { Counted, LeftOut };

/// Reads the state again and again. Its files stay open: to find and open them takes the kernel
/// longer than to read them. Files below the root take the place of the machine's own.
class MachineSources {
 public:
  /// The root must outlive it.
  explicit MachineSources(const DeviceRoot& root) : root_(root) {}

  MachineReading read(Processes processes);

 private:
  /// What a file says now, valid until the next call; empty when it cannot be read.
  std::string_view contentOf(std::string_view devicePath);
  void readCpu(MachineReading& reading);
  void readMemory(MachineReading& reading);
  std::optional<MachineReading::Traffic> readNetwork();
  std::optional<MachineReading::Traffic> readDisks();
  bool isDisk(std::string_view name);

  const DeviceRoot& root_;
  std::map<std::string, Descriptor, std::less<>> files_;  // by path on the device
  std::map<std::string, bool, std::less<>> disks_;        // whether a block device is one, by name
  std::string content_;
};

/// Ticks per second in which the kernel counts CPU time.
std::int64_t ticksPerSecond();

}  // namespace tavrel
