// Sources whose texts are tables: disks, network interfaces, processors, memory, pressure.
#include <string>
#include <string_view>
#include <unistd.h>
#include <vector>

#include "platform/linux/live/attribute_class.h"
#include "platform/linux/live/device_tables.h"
#include "platform/linux/live/sources.h"
#include "platform/linux/live/text_table.h"

namespace tavrel::live {
namespace {

constexpr Scale kSectors{512, 1};
constexpr Scale kTicks{10, 1};  // of 10 ms
constexpr Scale kPerKibibyte{1024, 1};
constexpr TableForm kOneRow{.key = TableForm::kNoKey};

// Tokens of /proc/diskstats: 0 to 2 are major, minor, name.
constexpr Column kDisk[] = {
    {3, "reads", kEvents},
    {4, "read_merges", kEvents},
    {5, "read_bytes", kBytes, kSectors, {"disks.read_bytes"}},
    {6, "read_time", kMilliseconds},
    {7, "writes", kEvents, {}, {"disks.writes"}},
    {8, "write_merges", kEvents},
    {9, "written_bytes", kBytes, kSectors, {"disks.written_bytes"}},
    {10, "write_time", kMilliseconds},
    {11, "in_flight", kPlain},
    {12, "io_time", kMilliseconds, {}, {"disks.io_time"}},
    {13, "weighted_time", kMilliseconds},
    {14, "discards", kEvents},
    {15, "discard_merges", kEvents},
    {16, "discarded_bytes", kBytes, kSectors, {"disks.discarded_bytes"}},
    {17, "discard_time", kMilliseconds},
    {18, "flushes", kEvents, {}, {"disks.flushes"}},
    {19, "flush_time", kMilliseconds},
};

// The machine's interfaces, even for a process in another network namespace; the reader's own when
// process 1 is hidden.
constexpr std::string_view kMachineInterfaces = "/proc/1/net/dev";
constexpr std::string_view kOwnInterfaces = "/proc/net/dev";

// Tokens of an interface's line: 0 is the name.
constexpr Column kInterface[] = {
    {1, "rx_bytes", kBytes, {}, {"net.rx_bytes"}},
    {2, "rx_packets", kPackets},
    {3, "rx_errors", kPackets, {}, {"net.rx_errors"}},
    {4, "rx_dropped", kPackets, {}, {"net.rx_dropped"}},
    {5, "rx_fifo_errors", kPackets},
    {6, "rx_frame_errors", kPackets},
    {7, "rx_compressed", kPackets},
    {8, "rx_multicast", kPackets},
    {9, "tx_bytes", kBytes, {}, {"net.tx_bytes"}},
    {10, "tx_packets", kPackets},
    {11, "tx_errors", kPackets, {}, {"net.tx_errors"}},
    {12, "tx_dropped", kPackets, {}, {"net.tx_dropped"}},
    {13, "tx_fifo_errors", kPackets},
    {14, "tx_collisions", kPackets},
    {15, "tx_carrier_errors", kPackets},
    {16, "tx_compressed", kPackets},
};

// Tokens of a processor's line in /proc/stat.
constexpr Column kProcessor[] = {
    {1, "user", kMilliseconds, kTicks},    {2, "nice", kMilliseconds, kTicks},
    {3, "system", kMilliseconds, kTicks},  {4, "idle", kMilliseconds, kTicks},
    {5, "iowait", kMilliseconds, kTicks},  {6, "irq", kMilliseconds, kTicks},
    {7, "softirq", kMilliseconds, kTicks}, {8, "steal", kMilliseconds, kTicks},
    {9, "guest", kMilliseconds, kTicks},   {10, "guest_nice", kMilliseconds, kTicks},
};
constexpr Figure kAllProcessors[] = {
    {"cpu", 1, "cpu.user", kMilliseconds, kTicks, kItself},
    {"cpu", 2, "cpu.nice", kMilliseconds, kTicks, kItself},
    {"cpu", 3, "cpu.system", kMilliseconds, kTicks, kItself},
    {"cpu", 4, "cpu.idle", kMilliseconds, kTicks, kItself},
    {"cpu", 5, "cpu.iowait", kMilliseconds, kTicks, kItself},
    {"cpu", 6, "cpu.irq", kMilliseconds, kTicks},
    {"cpu", 7, "cpu.softirq", kMilliseconds, kTicks},
    {"cpu", 8, "cpu.steal", kMilliseconds, kTicks, kItself},
    {"intr", 1, "cpu.interrupts", kEvents, {}, kItself},
    {"softirq", 1, "cpu.softirqs", kEvents},
    {"ctxt", 1, "cpu.switches", kEvents, {}, kItself},
    {"processes", 1, "cpu.forks", kEvents, {}, kItself},
    {"procs_running", 1, "cpu.running", kPlain},
    {"procs_blocked", 1, "cpu.blocked", kPlain},
};

// Tokens of a processor's line in /proc/schedstat; the first six after its name are obsolete.
constexpr Column kRunQueue[] = {
    {7, "sched_run", kNanoseconds},
    {8, "sched_wait", kNanoseconds},
    {9, "sched_slices", kEvents},
};

constexpr Scale kPageScale{0, 1};  // replaced by the page size

constexpr Figure kVmStatistics[] = {
    {"pgpgin", 1, "memory.paged_in", kBytes, kPerKibibyte},
    {"pgpgout", 1, "memory.paged_out", kBytes, kPerKibibyte},
    {"pswpin", 1, "memory.swapped_in", kBytes, kPageScale, kItself},
    {"pswpout", 1, "memory.swapped_out", kBytes, kPageScale, kItself},
    {"pgfault", 1, "memory.faults", kEvents},
    {"pgmajfault", 1, "memory.major_faults", kEvents, {}, kItself},
    {"pgscan_kswapd", 1, "memory.scanned_kswapd", kBytes, kPageScale},
    {"pgscan_direct", 1, "memory.scanned_direct", kBytes, kPageScale},
    {"pgsteal_kswapd", 1, "memory.reclaimed_kswapd", kBytes, kPageScale},
    {"pgsteal_direct", 1, "memory.reclaimed_direct", kBytes, kPageScale},
    {"allocstall_normal", 1, "memory.stalls_normal", kEvents},
    {"allocstall_movable", 1, "memory.stalls_movable", kEvents},
    {"compact_stall", 1, "memory.compact_stalls", kEvents},
    {"workingset_refault_anon", 1, "memory.refaults_anon", kEvents},
    {"workingset_refault_file", 1, "memory.refaults_file", kEvents},
    {"thp_fault_alloc", 1, "memory.huge_faults", kEvents},
    {"oom_kill", 1, "memory.oom_kills", kEvents, {}, kItself},
};

constexpr Figure kMemoryUse[] = {
    {"MemTotal", 1, "memory.total", kKibibytes},
    {"MemFree", 1, "memory.free", kKibibytes},
    {"MemAvailable", 1, "memory.available", kKibibytes},
    {"Buffers", 1, "memory.buffers", kKibibytes},
    {"Cached", 1, "memory.cached", kKibibytes},
    {"SwapTotal", 1, "memory.swap_total", kKibibytes},
    {"SwapFree", 1, "memory.swap_free", kKibibytes},
    {"Dirty", 1, "memory.dirty", kKibibytes},
    {"Writeback", 1, "memory.writeback", kKibibytes},
    {"AnonPages", 1, "memory.anonymous", kKibibytes},
    {"Mapped", 1, "memory.mapped", kKibibytes},
    {"Shmem", 1, "memory.shared", kKibibytes},
    {"Slab", 1, "memory.slab", kKibibytes},
    {"SReclaimable", 1, "memory.slab_reclaimable", kKibibytes},
    {"KernelStack", 1, "memory.kernel_stacks", kKibibytes},
    {"PageTables", 1, "memory.page_tables", kKibibytes},
    {"Committed_AS", 1, "memory.committed", kKibibytes},
    {"HardwareCorrupted", 1, "memory.hardware_corrupted", kKibibytes, {}, kItself},
};

// "some avg10=0.00 avg60=0.00 avg300=0.00 total=0": the last token is the ninth.
constexpr std::size_t kPressureTotal = 8;
constexpr TableForm kPressureForm{.separator = '='};
constexpr Figure kPressure[] = {
    {"some", kPressureTotal, "pressure_some", kMicroseconds, {}, kItself},
    {"full", kPressureTotal, "pressure_full", kMicroseconds, {}, kItself},
};

constexpr Figure kZramMemory[] = {
    {"", 0, "zram_data", kBytes},      {"", 1, "zram_compressed", kBytes},
    {"", 2, "zram_used", kBytes},      {"", 3, "zram_limit", kBytes},
    {"", 4, "zram_used_max", kBytes},  {"", 5, "zram_same_pages", kPlain},
    {"", 6, "zram_compacted", kPlain}, {"", 7, "zram_huge_pages", kPlain},
};
constexpr Figure kZramBacking[] = {
    {"", 0, "zram_backed", kPages},
    {"", 1, "zram_backing_reads", kPages},
    {"", 2, "zram_backing_writes", kPages},
};
constexpr Figure kZramErrors[] = {
    {"", 0, "zram_failed_reads", kEvents},
    {"", 1, "zram_failed_writes", kEvents},
};

constexpr std::string_view kResources[] = {"cpu", "memory", "io", "irq"};

}  // namespace

void addBlockDevices(const DeviceRoot& root, LiveSource& source) {
  addDeviceTable(root,
                 {.path = "/proc/diskstats",
                  .group = "Block",
                  .form = {.key = 2},
                  .columns = kDisk,
                  .daily = "/sys/block",
                  .only = "/sys/block"},
                 source);
}

void addNetwork(const DeviceRoot& root, LiveSource& source) {
  const bool machine = access(root.path(kMachineInterfaces).c_str(), R_OK) == 0;
  addDeviceTable(root,
                 {.path = machine ? kMachineInterfaces : kOwnInterfaces,
                  .group = "Network",
                  .form = {.headings = 2},
                  .columns = kInterface,
                  .daily = "/sys/class/net"},
                 source);
}

void addCpuTime(const DeviceRoot& root, LiveSource& source) {
  const std::string_view path = "/proc/stat";
  addFigures(root.path(path), {.group = "CPU Time", .figures = kAllProcessors}, source);
  addDeviceTable(
      root, {.path = path, .group = "CPU Time", .form = {}, .columns = kProcessor, .prefix = "cpu"},
      source);
}

void addScheduler(const DeviceRoot& root, LiveSource& source) {
  addDeviceTable(root,
                 {.path = "/proc/schedstat",
                  .group = "Scheduler",
                  .form = {},
                  .columns = kRunQueue,
                  .prefix = "cpu"},
                 source);
}

void addMemory(const DeviceRoot& root, LiveSource& source) {
  std::vector<Figure> figures(std::begin(kVmStatistics), std::end(kVmStatistics));
  for (Figure& figure : figures) {
    if (figure.scale.multiply == 0) figure.scale.multiply = sysconf(_SC_PAGESIZE);
  }
  addFigures(root.path("/proc/vmstat"),
             {.group = "Memory", .figures = figures, .mode = ReadMode::ToEnd}, source);
  addFigures(root.path("/proc/meminfo"), {.group = "Memory Use", .figures = kMemoryUse}, source);
}

void addPressure(const DeviceRoot& root, LiveSource& source) {
  for (const std::string_view resource : kResources) {
    const std::string name(resource);
    std::span<const Figure> figures = kPressure;
    // The kernel does not define when all tasks of the system wait for a processor, and writes 0.
    // It does not count when some wait for the end of interrupts.
    if (resource == "cpu") figures = figures.first(1);
    if (resource == "irq") figures = figures.last(1);
    addFigures(root.path("/proc/pressure/" + name),
               {.group = "Pressure",
                .subGroup = resource,
                .prefix = name + '.',
                .figures = figures,
                .form = kPressureForm},
               source);
  }
}

void addSuspend(const DeviceRoot& root, LiveSource& source) {
  addAttributes(root.path("/sys/power/suspend_stats"), {"Suspend", "", kPlain}, "",
                suspendAttributes(), Speed::Quick, source);
}

void addSwapDevices(const DeviceRoot& root, LiveSource& source) {
  for (const NamedDevice& device : devicesIn(root, "/sys/block", "zram", "", false, source)) {
    const std::string prefix = device.name + '.';
    const auto add = [&](const char* file, std::span<const Figure> figures) {
      addFigures(device.path + file,
                 {.group = "Swap",
                  .subGroup = device.name,
                  .prefix = prefix,
                  .figures = figures,
                  .form = kOneRow},
                 source);
    };
    add("/mm_stat", kZramMemory);
    add("/bd_stat", kZramBacking);
    add("/io_stat", kZramErrors);
  }
}

}  // namespace tavrel::live
