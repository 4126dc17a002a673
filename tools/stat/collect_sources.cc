#include "tools/stat/collect_sources.h"

#include <charconv>
#include <filesystem>
#include <fstream>
#include <iterator>
#include <string>
#include <sys/statvfs.h>
#include <unistd.h>
#include <vector>

namespace tavrel {
namespace {

std::string contentOf(const DeviceRoot& root, std::string_view devicePath) {
  std::ifstream stream(root.pathOrMachine(devicePath), std::ios::binary);
  return {std::istreambuf_iterator<char>(stream), {}};
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
    const std::string device = "/sys/block/" + std::string(fields[kName]) + "/device";
    std::error_code ignored;
    if (!std::filesystem::exists(root.pathOrMachine(device), ignored)) continue;
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
  std::error_code code;
  std::filesystem::directory_iterator zones(root.pathOrMachine("/sys/class/thermal"), code);
  for (; !code && zones != std::filesystem::directory_iterator(); zones.increment(code)) {
    if (!zones->path().filename().string().starts_with("thermal_zone")) continue;
    std::ifstream stream(zones->path() / "temp");
    std::int64_t thousandths = 0;
    if (!(stream >> thousandths)) continue;
    const double celsius = static_cast<double>(thousandths) / 1000;
    if (!hottest || celsius > *hottest) hottest = celsius;
  }
  return hottest;
}

std::optional<std::uint64_t> countProcesses(const DeviceRoot& root) {
  std::error_code code;
  std::uint64_t count = 0;
  std::filesystem::directory_iterator entries(root.pathOrMachine("/proc"), code);
  for (; !code && entries != std::filesystem::directory_iterator(); entries.increment(code)) {
    const std::string name = entries->path().filename();
    if (name.find_first_not_of("0123456789") == std::string::npos) ++count;
  }
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

MachineReading readMachine(const DeviceRoot& root) {
  MachineReading reading;
  reading.uptimeSeconds = firstNumber<double>(contentOf(root, "/proc/uptime"));
  reading.loadOfOneMinute = firstNumber<double>(contentOf(root, "/proc/loadavg"));
  reading.processes = countProcesses(root);
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
