// The kernel's texts: names, numbers, tables and interrupts, through a tree of files.
#include <cstddef>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>

#include "platform/linux/live/kernel_text.h"
#include "platform/linux/live/live_machine.h"
#include "platform/report_protocol.h"

namespace {

using namespace tavrel;

class Silent final : public SystemLog {
 public:
  void write(LogLevel, std::string_view) override {}
};

// The first byte of the input chooses the file.
constexpr const char* kFiles[] = {
    "/proc/stat",
    "/proc/interrupts",
    "/proc/diskstats",
    "/proc/net/dev",
    "/proc/pressure/io",
    "/proc/vmstat",
    "/sys/class/devfreq/a/trans_stat",
    "/sys/class/thermal/cooling_device0/stats/time_in_state_ms",
    "/sys/class/thermal/cooling_device0/stats/trans_table",
    "/sys/class/hwmon/hwmon0/name",
    "/sys/block/zram0/mm_stat",
    "/sys/power/suspend_stats/success",
};

class Tree {
 public:
  Tree() {
    if (!mkdtemp(folder_.data())) std::abort();
    for (const char* const file : kFiles)
      std::filesystem::create_directories(std::filesystem::path(folder_ + file).parent_path());
    std::ofstream(folder_ + "/sys/class/hwmon/hwmon0/in0_input") << "1";
    std::ofstream(folder_ + "/sys/class/thermal/cooling_device0/stats/time_in_state_ms")
        << "state0\t1\nstate1\t2\n";
  }
  ~Tree() { std::filesystem::remove_all(folder_); }
  Tree(const Tree&) = delete;
  Tree& operator=(const Tree&) = delete;

  const std::string& folder() const { return folder_; }

 private:
  std::string folder_ = "/dev/shm/live-fuzz-XXXXXX";
};

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  static const Tree tree;
  if (size == 0) return 0;
  const std::string text(reinterpret_cast<const char*>(data) + 1, size - 1);
  const std::string path = tree.folder() + kFiles[data[0] % std::size(kFiles)];
  std::ofstream(path) << text;

  const DeviceRoot root(tree.folder());
  Silent log;
  LiveMachine machine(root, log);
  const auto sampling = machine.subscribe();
  std::size_t count = 0;
  std::size_t largest = kElementBytes;
  for (const plist::Value& service : machine.services()) {
    const auto driver = service.dictionary().number("EntryID")->int64();
    const auto properties = service.dictionary().dictionary("Properties");
    for (const plist::Value& group : properties.array("IOReportLegend")) {
      for (const plist::Value& channel : group.dictionary().array("IOReportChannels")) {
        const auto id = channel.array().at(0).number()->int64();
        const std::size_t bytes =
            sampling->add(static_cast<std::uint64_t>(driver), static_cast<std::uint64_t>(id));
        if (bytes == 0) std::abort();  // every channel of a legend is known
        largest = std::max(largest, bytes);
        ++count;
      }
    }
  }
  sampling->update();
  std::vector<std::byte> room(largest);
  for (std::size_t i = 0; i < count; ++i)
    sampling->write(i, room);
  std::filesystem::resize_file(path, 0);
  sampling->update();
  std::string_view rest = text;
  while (!rest.empty())
    live::channelName(live::takeLine(rest));
  return 0;
}
