// The kernel's texts that report channels come from: names, numbers, tables and interrupts, in a
// tree of files without traces of earlier inputs. Each channel of a legend must be known, and the
// values of all channels must fit in the announced room, even after a file has become empty.
//
// Input: the number of a file, its content and 0xFF; repeated.
#include <array>
#include <set>
#include <utility>
#include <vector>

#include "base/ascii.h"
#include "memory_tree.h"
#include "platform/linux/live/kernel_text.h"
#include "platform/linux/live/live_machine.h"
#include "platform/report_protocol.h"
#include "support.h"

namespace {

using namespace tavrel;
using fuzz::require;

struct File {
  const char* path;
  const char* content;  // used when the input has another file of the device, but not this one
  bool isSlow = false;  // read by a separate thread, because a device may block the reader
};
constexpr LiveMachine::Options kPatient{10'000, 10'000};
// Append new files at the end, because inputs contain the numbers.
constexpr File kFiles[] = {
    {"/proc/stat", ""},
    {"/proc/interrupts", ""},
    {"/proc/diskstats", ""},
    {"/proc/net/dev", ""},
    {"/proc/pressure/io", ""},
    {"/proc/vmstat", ""},
    {"/sys/class/devfreq/a/trans_stat", ""},
    {"/sys/class/thermal/cooling_device0/stats/time_in_state_ms", "state0\t1\nstate1\t2\n"},
    {"/sys/class/thermal/cooling_device0/stats/trans_table", ""},
    {"/sys/class/hwmon/hwmon0/name", ""},
    {"/sys/block/zram0/mm_stat", ""},
    {"/sys/power/suspend_stats/success", ""},
    {"/proc/softirqs", ""},
    {"/proc/schedstat", ""},
    {"/proc/meminfo", ""},
    {"/proc/swaps", ""},
    {"/proc/uptime", ""},
    {"/sys/devices/system/cpu/cpu0/cpuidle/state0/name", "C1"},
    {"/sys/devices/system/cpu/cpu0/cpuidle/state0/time", "7"},
    {"/sys/devices/system/cpu/cpufreq/policy0/stats/time_in_state", "1800000 5\n"},
    {"/sys/devices/system/cpu/cpufreq/policy0/stats/trans_table", ""},
    {"/sys/devices/system/edac/mc/mc0/ce_count", ""},
    {"/sys/devices/system/edac/mc/mc0/dimm0/dimm_label", ""},
    {"/sys/class/thermal/thermal_zone0/type", ""},
    {"/sys/class/thermal/thermal_zone0/temp", "40000", true},
    {"/sys/class/hwmon/hwmon0/in0_input", "1", true},
    {"/sys/class/hwmon/hwmon0/in0_label", ""},
    {"/sys/fs/cgroup/cgroup.controllers", ""},
    {"/sys/fs/cgroup/a.slice/cgroup.events", "populated 1\n"},
    {"/sys/fs/cgroup/a.slice/cpu.stat", ""},
    {"/sys/fs/cgroup/a.slice/memory.current", ""},
    {"/sys/fs/cgroup/a.slice/io.stat", ""},
    {"/sys/block/sda/dev", "8:0\n"},
    {"/sys/block/sda/device/x", "x"},
};

// The folder of the device that a file is about.
std::string_view deviceOf(std::string_view path) {
  constexpr std::string_view kGroups = "/sys/fs/cgroup";
  return path.starts_with(kGroups) ? kGroups : path.substr(0, path.rfind('/'));
}

// The sizes of all channels in bytes.
std::vector<std::size_t> subscribe(LiveMachine& machine, LiveSampling& sampling) {
  std::vector<std::size_t> sizes;
  for (const plist::Value& service : machine.services()) {
    const auto driver = service.dictionary().number("EntryID")->int64();
    const auto properties = service.dictionary().dictionary("Properties");
    for (const plist::Value& group : properties.array("IOReportLegend")) {
      for (const plist::Value& channel : group.dictionary().array("IOReportChannels")) {
        const auto id = channel.array().at(0).number()->int64();
        const std::size_t bytes =
            sampling.add(static_cast<std::uint64_t>(driver), static_cast<std::uint64_t>(id));
        require(bytes > 0 && bytes % kElementBytes == 0);
        sizes.push_back(bytes);
      }
    }
  }
  return sizes;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  std::array<std::string, std::size(kFiles)> contents;
  std::array<bool, std::size(kFiles)> isGiven{};
  // Other tables name the disk. Of other devices, only those that the input changes are there: to
  // find all of them takes longer than to read one.
  std::set<std::string_view> devices{"/sys/block/sda", "/sys/block/sda/device"};
  std::size_t last = 0;
  bool isPatient = false;
  while (!input.empty()) {
    last = input.byte() % contents.size();
    contents[last] = input.part();
    isGiven[last] = true;
    devices.insert(deviceOf(kFiles[last].path));
    isPatient = isPatient || kFiles[last].isSlow;
  }
  fuzz::Tree tree;
  for (std::size_t i = 0; i < contents.size(); ++i) {
    if (!isGiven[i] && devices.contains(deviceOf(kFiles[i].path))) contents[i] = kFiles[i].content;
    if (i == last || !contents[i].empty()) tree.write(kFiles[i].path, contents[i]);
  }

  // The thread takes longer than everything else; without patience, none is started.
  fuzz::SilentLog log;
  LiveMachine machine(tree.root, log, isPatient ? kPatient : LiveMachine::Options{0, 0});
  const auto sampling = machine.subscribe();
  const std::vector<std::size_t> sizes = subscribe(machine, *sampling);
  std::vector<std::byte> room(sizes.empty() ? 0 : std::ranges::max(sizes));
  for (const bool isEmptied : {false, true}) {
    if (isEmptied) tree.write(kFiles[last].path, "");
    sampling->update();
    for (std::size_t i = 0; i < sizes.size(); ++i) {
      const std::size_t written = sampling->write(i, room);
      require(written <= sizes[i] && written % kElementBytes == 0);
    }
  }
  for (std::string_view rest = contents[last]; !rest.empty();) {
    const std::string name = live::channelName(takeLine(rest));
    for (const char c : name)
      require(c > ' ' && c <= '~');
  }
  return 0;
}
