// The machine's state in /proc and /sys.
//
// A figure that could not be read has no value; it is never 0.
#pragma once

#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <optional>
#include <string>
#include <string_view>

#include "platform/linux/files/device_root.h"
#include "platform/linux/live/kernel_file.h"
#include "platform/linux/live/slow_reads.h"

namespace tavrel {

/// Counters run since the machine started; removing a device subtracts its part.
struct MachineReading {
  std::optional<double> uptimeSeconds;
  std::optional<double> loadOfOneMinute;
  std::optional<std::uint64_t> processes;

  /// Clock ticks summed over all CPUs.
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
  /// Bytes of all disks with a device of their own: no loop devices, mappings or RAM disks.
  std::optional<Traffic> disk;

  /// The hottest thermal zone.
  std::optional<double> celsius;

  /// The file system that holds the device's data folder.
  std::optional<std::uint64_t> diskTotalMib;
  std::optional<std::uint64_t> diskFreeMib;
};

/// Counting processes takes the kernel longer than everything else together.
enum class Processes : std::uint8_t { Counted, LeftOut };

/// Reads the state repeatedly. It keeps the files open, because the kernel takes longer to find and
/// open them than to read them. Files below the root replace the machine's own.
class MachineSources {
 public:
  /// The root and the log must outlive it. The log names sensors that do not answer.
  MachineSources(const DeviceRoot& root, SystemLog& log);

  MachineReading read(Processes processes);

 private:
  /// The current content of a file, valid until the next call; empty when it cannot be read as a
  /// whole.
  std::string_view contentOf(std::string_view devicePath);
  void readCpu(MachineReading& reading);
  void readMemory(MachineReading& reading);
  std::optional<MachineReading::Traffic> readNetwork();
  std::optional<MachineReading::Traffic> readDisks();
  std::optional<double> readTemperature();
  bool isDisk(std::string_view name);

  const DeviceRoot& root_;
  std::map<std::string, live::KernelFile, std::less<>> files_;  // by path on the device
  std::map<std::string, bool, std::less<>> disks_;              // whether it is a disk, by name
  std::map<std::string, std::shared_ptr<live::SlowFile>, std::less<>> zones_;  // by name
  live::SlowReads sensors_;
  live::DescriptorBudget descriptors_;
  live::TextBuffer buffer_;
};

/// The unit of the kernel's CPU time, in ticks per second.
std::int64_t ticksPerSecond();

}  // namespace tavrel
