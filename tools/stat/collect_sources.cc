#include "tools/stat/collect_sources.h"

#include <charconv>
#include <dirent.h>
#include <fcntl.h>
#include <filesystem>
#include <memory>
#include <string>
#include <sys/statvfs.h>
#include <unistd.h>
#include <vector>

#include "platform/linux/files/descriptor.h"

namespace tavrel {
namespace {

// Bytes of a file in /proc or /sys. Those of machines with hundreds of CPUs have some 100 KiB.
constexpr std::size_t kLargestFile = 1U << 20;

// Empty when it cannot be read.
std::string contentOf(const std::string& path) {
  const Descriptor file(open(path.c_str(), O_RDONLY | O_CLOEXEC));
  std::string content;
  if (!file) return content;
  char part[4096];
  for (ssize_t size = 0; (size = read(file.get(), part, sizeof part)) > 0;) {
    content.append(part, static_cast<std::size_t>(size));
    if (content.size() > kLargestFile) return {};
  }
  return content;
}

std::string contentOf(const DeviceRoot& root, std::string_view devicePath) {
  return contentOf(root.pathOrMachine(devicePath));
}

// Hands the names in a folder to `take`.
template <class Take>
void eachName(const std::string& folder, Take take) {
  const std::unique_ptr<DIR, int (*)(DIR*)> entries(opendir(folder.c_str()), closedir);
  if (!entries) return;
  while (const dirent* const entry = readdir(entries.get()))
    take(std::string_view(entry->d_name));
}

// Block devices of the kernel's own, which have no device behind them; there may be many.
bool isVirtualDisk(std::string_view name) {
  return name.starts_with("loop") || name.starts_with("ram") || name.starts_with("zram");
}

std::string_view takeLine(std::string_view& text) {
  const std::string_view line = text.substr(0, text.find('\n'));
  text.remove_prefix(std::min(text.size(), line.size() + 1));
  return line;
}

std::vector<std::string_view> fieldsOf(std::string_view line) {
  std::vector<std::string_view> fields;
  constexpr std::string_view kBlanks = " \t";
  for (auto start = line.find_first_not_of(kBlanks); start != std::string_view::npos;
       start = line.find_first_not_of(kBlanks, start)) {
    const auto end = std::min(line.find_first_of(kBlanks, start), line.size());
    fields.push_back(line.substr(start, end - start));
    start = end;
  }
  return fields;
}

template <class Number>
std::optional<Number> numberOf(std::string_view text) {
  Number number{};
  const auto [stop, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  if (error != std::errc() || stop == text.data()) return std::nullopt;
  return number;
}

template <class Number>
std::optional<Number> firstNumber(const std::string& text) {
  const auto fields = fieldsOf(text);
  return fields.empty() ? std::nullopt : numberOf<Number>(fields[0]);
}

// "cpu  user nice system idle iowait irq softirq steal ...", then a line for each CPU. Guest time
// is part of user time.
void readCpu(const DeviceRoot& root, MachineReading& reading) {
  constexpr std::size_t kIdle = 4;
  constexpr std::size_t kWaiting = 5;
  constexpr std::size_t kStolen = 8;
  const std::string content = contentOf(root, "/proc/stat");
  std::string_view rest = content;
  const auto all = fieldsOf(takeLine(rest));
  if (all.size() <= kWaiting || all[0] != "cpu") return;
  MachineReading::CpuTicks ticks{0, 0};
  for (std::size_t i = 1; i < all.size() && i <= kStolen; ++i) {
    const auto part = numberOf<std::uint64_t>(all[i]);
    if (!part) return;
    ticks.total += *part;
    if (i != kIdle && i != kWaiting) ticks.busy += *part;
  }
  reading.cpu = ticks;
  while (takeLine(rest).starts_with("cpu"))
    ++reading.cpus;
}

void readMemory(const DeviceRoot& root, MachineReading& reading) {
  const std::string content = contentOf(root, "/proc/meminfo");
  std::string_view rest = content;
  std::optional<std::uint64_t> swapTotal;
  std::optional<std::uint64_t> swapFree;
  while (!rest.empty()) {
    const auto fields = fieldsOf(takeLine(rest));
    if (fields.size() < 2) continue;
    const auto kib = numberOf<std::uint64_t>(fields[1]);
    if (fields[0] == "MemTotal:") reading.memoryTotalKib = kib;
    if (fields[0] == "MemAvailable:") reading.memoryAvailableKib = kib;
    if (fields[0] == "SwapTotal:") swapTotal = kib;
    if (fields[0] == "SwapFree:") swapFree = kib;
  }
  if (swapTotal && swapFree && *swapFree <= *swapTotal)
    reading.swapUsedKib = *swapTotal - *swapFree;
}

// "  eth0: bytes packets errs drop fifo frame compressed multicast bytes ...", after two lines of
// titles.
std::optional<MachineReading::Traffic> readNetwork(const DeviceRoot& root) {
  constexpr std::size_t kReceived = 0;
  constexpr std::size_t kSent = 8;
  const std::string content = contentOf(root, "/proc/net/dev");
  std::string_view rest = content;
  takeLine(rest);
  takeLine(rest);
  std::optional<MachineReading::Traffic> traffic;
  while (!rest.empty()) {
    const std::string_view line = takeLine(rest);
    const auto colon = line.find(':');
    if (colon == std::string_view::npos) continue;
    const auto name = fieldsOf(line.substr(0, colon));
    const auto fields = fieldsOf(line.substr(colon + 1));
    if (name.size() != 1 || name[0] == "lo" || fields.size() <= kSent) continue;
    const auto in = numberOf<std::uint64_t>(fields[kReceived]);
    const auto out = numberOf<std::uint64_t>(fields[kSent]);
    if (!in || !out) continue;
    if (!traffic) traffic.emplace(MachineReading::Traffic{0, 0});
    traffic->in += *in;
    traffic->out += *out;
  }
  return traffic;
}

// "major minor name reads merged sectors ms writes merged sectors ...", sectors of 512 bytes.
std::optional<MachineReading::Traffic> readDisks(const DeviceRoot& root) {
  constexpr std::size_t kName = 2;
  constexpr std::size_t kRead = 5;
  constexpr std::size_t kWritten = 9;
  constexpr std::uint64_t kSector = 512;
  const std::string content = contentOf(root, "/proc/diskstats");
  std::string_view rest = content;
  std::optional<MachineReading::Traffic> traffic;
  while (!rest.empty()) {
    const auto fields = fieldsOf(takeLine(rest));
    if (fields.size() <= kWritten) continue;
    if (isVirtualDisk(fields[kName])) continue;
    const std::string device = "/sys/block/" + std::string(fields[kName]) + "/device";
    if (access(root.pathOrMachine(device).c_str(), F_OK) != 0) continue;
    const auto in = numberOf<std::uint64_t>(fields[kRead]);
    const auto out = numberOf<std::uint64_t>(fields[kWritten]);
    if (!in || !out) continue;
    if (!traffic) traffic.emplace(MachineReading::Traffic{0, 0});
    traffic->in += *in * kSector;
    traffic->out += *out * kSector;
  }
  return traffic;
}

// Thermal zones give thousandths of a degree.
std::optional<double> readTemperature(const DeviceRoot& root) {
  std::optional<double> hottest;
  const std::string folder = root.pathOrMachine("/sys/class/thermal");
  eachName(folder, [&](std::string_view name) {
    if (!name.starts_with("thermal_zone")) return;
    const std::string text = contentOf(folder + '/' + std::string(name) + "/temp");
    const auto thousandths = firstNumber<std::int64_t>(text);
    if (!thousandths) return;
    const double celsius = static_cast<double>(*thousandths) / 1000;
    if (!hottest || celsius > *hottest) hottest = celsius;
  });
  return hottest;
}

std::optional<std::uint64_t> countProcesses(const DeviceRoot& root) {
  std::uint64_t count = 0;
  eachName(root.pathOrMachine("/proc"), [&](std::string_view name) {
    if (name.find_first_not_of("0123456789") == std::string_view::npos) ++count;
  });
  if (count == 0) return std::nullopt;
  return count;
}

void readDataFolder(const DeviceRoot& root, MachineReading& reading) {
  // The folder may not exist yet; it will then be on the file system of the one above.
  std::filesystem::path folder = root.path("/var/mobile");
  struct statvfs status;
  while (statvfs(folder.c_str(), &status) != 0) {
    if (!folder.has_relative_path()) return;
    folder = folder.parent_path();
  }
  const auto mib = [&](std::uint64_t blocks) { return blocks * status.f_frsize >> 20; };
  reading.diskTotalMib = mib(status.f_blocks);
  reading.diskFreeMib = mib(status.f_bavail);
}

}  // namespace

MachineReading readMachine(const DeviceRoot& root, Processes processes) {
  MachineReading reading;
  reading.uptimeSeconds = firstNumber<double>(contentOf(root, "/proc/uptime"));
  reading.loadOfOneMinute = firstNumber<double>(contentOf(root, "/proc/loadavg"));
  if (processes == Processes::Counted) reading.processes = countProcesses(root);
  readCpu(root, reading);
  readMemory(root, reading);
  reading.network = readNetwork(root);
  reading.disk = readDisks(root);
  reading.celsius = readTemperature(root);
  readDataFolder(root, reading);
  return reading;
}

std::int64_t ticksPerSecond() {
  const long ticks = sysconf(_SC_CLK_TCK);
  return ticks > 0 ? ticks : 100;
}

}  // namespace tavrel
