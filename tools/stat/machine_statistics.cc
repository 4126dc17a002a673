#include "tools/stat/machine_statistics.h"

#include <algorithm>

namespace tavrel {
namespace {

template <class Number>
std::optional<double> real(const std::optional<Number>& number, double divisor = 1) {
  if (!number) return std::nullopt;
  return static_cast<double>(*number) / divisor;
}

// The growth of a counter. When a counter has gone back, it was restarted or lost a device,
// and its growth is unknown.
std::optional<double> growth(std::uint64_t now, std::uint64_t before) {
  if (now < before) return std::nullopt;
  return static_cast<double>(now - before);
}

using TrafficMember = std::optional<MachineReading::Traffic> MachineReading::*;
using Direction = std::uint64_t MachineReading::Traffic::*;

template <TrafficMember traffic, Direction direction>
std::optional<double> kib(const MachineReading& now, const MachineReading* before, double) {
  if (!before || !(now.*traffic) || !(before->*traffic)) return std::nullopt;
  const auto bytes = growth((*(now.*traffic)).*direction, (*(before->*traffic)).*direction);
  return real(bytes, 1024);
}

template <TrafficMember traffic, Direction direction>
std::optional<double> kibPerSecond(const MachineReading& now, const MachineReading* before,
                                   double secondsBetween) {
  if (secondsBetween <= 0) return std::nullopt;
  return real(kib<traffic, direction>(now, before, 0), secondsBetween);
}

std::optional<double> busyTicks(const MachineReading& now, const MachineReading* before, double) {
  if (!before || !now.cpu || !before->cpu) return std::nullopt;
  return growth(now.cpu->busy, before->cpu->busy);
}

std::optional<double> busyPercent(const MachineReading& now, const MachineReading* before, double) {
  const auto busy = busyTicks(now, before, 0);
  if (!busy) return std::nullopt;
  const auto total = growth(now.cpu->total, before->cpu->total);
  if (!total || *total <= 0) return std::nullopt;
  // The kernel may take back waiting time; the total then grows by less than its busy part.
  return 100 * std::min(*busy / *total, 1.0);
}

constexpr auto kNetwork = &MachineReading::network;
constexpr auto kDisk = &MachineReading::disk;
constexpr auto kIn = &MachineReading::Traffic::in;
constexpr auto kOut = &MachineReading::Traffic::out;

constexpr MachineStatistic kStatistics[] = {
    {"com.norvane.usage.uptime.seconds", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.uptimeSeconds);
     }},
    {"com.norvane.usage.cpu.count", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) -> std::optional<double> {
       if (now.cpus == 0) return std::nullopt;
       return static_cast<double>(now.cpus);
     }},
    {"com.norvane.usage.processes", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) { return real(now.processes); }},
    {"com.norvane.usage.memory.total_mib", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.memoryTotalKib, 1024);
     }},
    {"com.norvane.usage.memory.available_mib", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.memoryAvailableKib, 1024);
     }},
    {"com.norvane.usage.swap.used_mib", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.swapUsedKib, 1024);
     }},
    {"com.norvane.usage.disk.total_mib", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.diskTotalMib);
     }},
    {"com.norvane.usage.disk.free_mib", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.diskFreeMib);
     }},
    {"com.norvane.usage.samples", Keeping::Sum,
     [](const MachineReading&, const MachineReading*, double) { return std::optional<double>(1); }},
    {"com.norvane.usage.cpu.busy_milliseconds", Keeping::Sum,
     [](const MachineReading& now, const MachineReading* before, double) {
       return real(busyTicks(now, before, 0), static_cast<double>(ticksPerSecond()) / 1000);
     }},
    {"com.norvane.usage.network.received_kib", Keeping::Sum, kib<kNetwork, kIn>},
    {"com.norvane.usage.network.sent_kib", Keeping::Sum, kib<kNetwork, kOut>},
    {"com.norvane.usage.disk.read_kib", Keeping::Sum, kib<kDisk, kIn>},
    {"com.norvane.usage.disk.written_kib", Keeping::Sum, kib<kDisk, kOut>},
    {"com.norvane.usage.cpu.busy_percent", Keeping::Series, busyPercent},
    {"com.norvane.usage.load.one_minute", Keeping::Series,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.loadOfOneMinute);
     }},
    {"com.norvane.usage.memory.used_percent", Keeping::Series,
     [](const MachineReading& now, const MachineReading*, double) -> std::optional<double> {
       if (!now.memoryTotalKib || !now.memoryAvailableKib || *now.memoryTotalKib == 0) {
         return std::nullopt;
       }
       return 100 - 100 * static_cast<double>(*now.memoryAvailableKib) /
                        static_cast<double>(*now.memoryTotalKib);
     }},
    {"com.norvane.usage.network.received_kib_per_second", Keeping::Series,
     kibPerSecond<kNetwork, kIn>},
    {"com.norvane.usage.network.sent_kib_per_second", Keeping::Series,
     kibPerSecond<kNetwork, kOut>},
    {"com.norvane.usage.disk.read_kib_per_second", Keeping::Series, kibPerSecond<kDisk, kIn>},
    {"com.norvane.usage.disk.written_kib_per_second", Keeping::Series, kibPerSecond<kDisk, kOut>},
    {"com.norvane.usage.temperature.celsius", Keeping::Series,
     [](const MachineReading& now, const MachineReading*, double) { return real(now.celsius); }},
};

}  // namespace

std::span<const MachineStatistic> machineStatistics() {
  return kStatistics;
}

std::string_view collectedKeysHelp() {
  return "Scalars, under com.norvane.usage.:\n"
         "  uptime.seconds, cpu.count, processes, memory.total_mib, memory.available_mib,\n"
         "  swap.used_mib, disk.total_mib, disk.free_mib (the latest reading);\n"
         "  samples, cpu.busy_milliseconds, network.received_kib, network.sent_kib,\n"
         "  disk.read_kib, disk.written_kib (added up over the day's readings)\n"
         "Distributions, under com.norvane.usage.:\n"
         "  cpu.busy_percent, load.one_minute, memory.used_percent,\n"
         "  network.received_kib_per_second, network.sent_kib_per_second,\n"
         "  disk.read_kib_per_second, disk.written_kib_per_second, temperature.celsius";
}

}  // namespace tavrel
