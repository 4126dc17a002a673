// The kernel's texts that `stat collect` and the uploader parse, and the reading that one
// collection leaves for the next. Parts must not exceed their wholes, a route that is found must be
// in the table, and a reading that was written must read back.
//
// Input: a byte that chooses the reader, then contents separated by 0xFF.
#include "base/limits.h"
#include "memory_tree.h"
#include "support.h"
#include "tools/stat/collect_sources.h"
#include "tools/stat/collect_state.h"
#include "tools/stat/machine_statistics.h"
#include "upload/network.h"

using namespace tavrel;
using fuzz::require;

namespace {

constexpr std::string_view kFiles[] = {"/proc/stat",
                                       "/proc/meminfo",
                                       "/proc/net/dev",
                                       "/proc/diskstats",
                                       "/proc/uptime",
                                       "/proc/loadavg",
                                       "/sys/class/thermal/thermal_zone0/temp"};

void collect(fuzz::Tree& tree, fuzz::Input& input, unsigned first) {
  // Without these files, the machine's own would be read.
  for (const std::string_view file : kFiles)
    tree.write(file, "");
  tree.write("/sys/block/sda/device/x", "");
  for (unsigned i = 0; i < 3 && !input.empty(); ++i)
    tree.write(kFiles[(first + i) % std::size(kFiles)], input.part());
  fuzz::SilentLog log;
  MachineSources sources(tree.root, log);
  const MachineReading reading = sources.read(Processes::Counted);
  // The second reading uses the files that the first has left open.
  const MachineReading again = sources.read(Processes::LeftOut);
  require(again.cpu.has_value() == reading.cpu.has_value() && again.cpus == reading.cpus);
  require(again.memoryTotalKib == reading.memoryTotalKib && !again.processes);
  if (reading.cpu) {
    require(again.cpu->total == reading.cpu->total && reading.cpu->busy <= reading.cpu->total);
  }
  if (reading.memoryTotalKib) require(reading.memoryAvailableKib <= reading.memoryTotalKib);
  if (reading.diskTotalMib) require(reading.diskFreeMib <= reading.diskTotalMib);
  MachineReading start;
  start.cpu = {0, 0};
  for (const MachineStatistic& statistic : machineStatistics()) {
    const auto number = statistic.measure(reading, &start, 1);
    if (number && std::string_view(statistic.key).ends_with("_percent"))
      require(*number >= 0 && *number <= 100);
  }

  CollectState state;
  state.machine = reading;
  state.at = std::chrono::nanoseconds(7);
  state.remainders["com.example.x"] = 0.25;
  const std::string path = tree.root.path("/state");
  require(static_cast<bool>(writeCollectState(path, "boot", state)));
  const auto kept = readCollectState(path, "boot", std::chrono::nanoseconds(8));
  require(kept && *kept && (*kept)->remainders == state.remainders);
  require((*kept)->machine.network.has_value() == reading.network.has_value());
  if (reading.disk) require((*kept)->machine.disk->in == reading.disk->in);
}

void remember(fuzz::Tree& tree, fuzz::Input& input) {
  const std::string path = tree.root.path("/state");
  tree.write("/state", input.text());
  const auto now = std::chrono::hours(1);
  const auto state = readCollectState(path, "b", now);
  if (!state || !*state) return;
  for (const auto& [key, number] : (*state)->remainders)
    require(number >= 0 && number < 1);
  require(static_cast<bool>(writeCollectState(path, "b", **state)));
  const auto again = readCollectState(path, "b", now);
  require(again && *again && (*again)->at == (*state)->at &&
          (*again)->remainders == (*state)->remainders);
}

void route(fuzz::Tree& tree, fuzz::Input& input) {
  FileSystem files;
  const std::string first = input.part();
  const std::string second = input.part();
  tree.write("/proc/self/net/route", first);
  tree.write("/proc/self/net/ipv6_route", second);
  upload::Configuration configuration;
  const std::string reason = *upload::reasonToWait(tree.root, files, configuration);
  require(reason.empty() || reason == "there is no default route");
  configuration.meteredInterfaces = {"*"};
  const std::string metered = *upload::reasonToWait(tree.root, files, configuration);
  if (!reason.empty()) return require(metered == reason);
  constexpr std::string_view kBeginning = "the network is metered (";
  require(metered.starts_with(kBeginning));
  const std::string name =
      metered.substr(kBeginning.size(), metered.size() - 1 - kBeginning.size());
  require((first + second).find(name) != std::string::npos);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  fuzz::Tree tree;
  const unsigned choice = input.byte();
  switch (choice % 4) {
    case 0:
      remember(tree, input);
      break;
    case 1:
      route(tree, input);
      break;
    default:
      collect(tree, input, choice / 4);
  }
  return 0;
}
