#include "tools/stat/collect_sources.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <filesystem>
#include <string>
#include <sys/statvfs.h>
#include <unistd.h>
#include <utility>
#include <vector>

#include "base/arithmetic.h"
#include "base/ascii.h"
#include "base/limits.h"
#include "platform/linux/files/folder_walk.h"

namespace tavrel {
namespace {

// Block devices that the kernel provides without hardware; there may be many.
bool isVirtualDisk(std::string_view name) {
  return name.starts_with("loop") || name.starts_with("ram") || name.starts_with("zram");
}

// The first fields of a line; only as many as are used.
class Fields {
 public:
  explicit Fields(std::string_view line) {
    const auto isBlank = [](char c) { return c == ' ' || c == '\t'; };
    const char* at = line.data();
    const char* const end = at + line.size();
    while (count_ < fields_.size()) {
      at = std::find_if_not(at, end, isBlank);
      if (at == end) break;
      const char* const start = std::exchange(at, std::find_if(at, end, isBlank));
      fields_[count_++] = {start, at};
    }
  }
  std::size_t size() const { return count_; }
  bool empty() const { return count_ == 0; }
  std::string_view operator[](std::size_t number) const { return fields_[number]; }

 private:
  std::array<std::string_view, 10> fields_;
  std::size_t count_ = 0;
};

template <class Number>
std::optional<Number> numberOf(std::string_view text) {
  Number number{};
  const auto [stop, error] = std::from_chars(text.data(), text.data() + text.size(), number);
  if (error != std::errc() || stop == text.data()) return std::nullopt;
  return number;
}

template <class Number>
std::optional<Number> firstNumber(std::string_view text) {
  const Fields fields(text);
  return fields.empty() ? std::nullopt : numberOf<Number>(fields[0]);
}

// Adds the counters of a device. Leaves it out when they are unknown or too large for a sum.
void addDevice(std::optional<MachineReading::Traffic>& traffic, std::optional<std::uint64_t> in,
               std::optional<std::uint64_t> out) {
  MachineReading::Traffic sum = traffic.value_or(MachineReading::Traffic{0, 0});
  if (!in || !out || __builtin_add_overflow(sum.in, *in, &sum.in) ||
      __builtin_add_overflow(sum.out, *out, &sum.out)) {
    return;
  }
  traffic = sum;
}

std::optional<std::uint64_t> countProcesses(const DeviceRoot& root) {
  std::uint64_t count = 0;
  const int code = walkFolder(root.pathOrMachine("/proc"), [&](const dirent& entry) {
    const std::string_view name = entry.d_name;
    if (name.find_first_not_of("0123456789") == std::string_view::npos) ++count;
    return true;
  });
  if (code != 0 || count == 0) return std::nullopt;
  return count;
}

void readDataFolder(const DeviceRoot& root, MachineReading& reading) {
  // If the folder does not exist yet, it will be on its parent's file system.
  std::filesystem::path folder = root.path("/var/mobile");
  struct statvfs status;
  while (statvfs(folder.c_str(), &status) != 0) {
    if (!folder.has_relative_path()) return;
    folder = folder.parent_path();
  }
  const auto mib = [&](std::uint64_t blocks) -> std::optional<std::uint64_t> {
    const auto bytes = checkedMultiply(blocks, status.f_frsize);
    return bytes ? std::optional(*bytes >> 20) : std::nullopt;
  };
  reading.diskTotalMib = mib(status.f_blocks);
  if (status.f_bavail <= status.f_blocks) reading.diskFreeMib = mib(status.f_bavail);
}

}  // namespace

MachineSources::MachineSources(const DeviceRoot& root, SystemLog& log)
    : root_(root), sensors_(log, {limits::kSensorMilliseconds, limits::kSensorsMilliseconds}) {}

std::string_view MachineSources::contentOf(std::string_view devicePath) {
  auto found = files_.find(devicePath);
  if (found == files_.end()) {
    live::KernelFile file(root_.pathOrMachine(devicePath), live::ReadMode::ToEnd);
    found = files_.emplace(devicePath, std::move(file)).first;
  }
  const auto text = found->second.read(descriptors_, buffer_);
  return text && !buffer_.isCut() ? *text : std::string_view();
}

bool MachineSources::isDisk(std::string_view name) {
  const auto found = disks_.find(name);
  if (found != disks_.end()) return found->second;
  std::string entry(name);
  std::ranges::replace(entry, '/', '!');
  const bool is =
      !isVirtualDisk(name) && live::isOwnDevice(root_.pathOrMachine("/sys/block/" + entry));
  disks_.emplace(name, is);
  return is;
}

// "cpu  user nice system idle iowait irq softirq steal ...", followed by a line for each CPU. User
// time includes guest time.
void MachineSources::readCpu(MachineReading& reading) {
  constexpr std::size_t kIdle = 4;
  constexpr std::size_t kWaiting = 5;
  constexpr std::size_t kStolen = 8;
  std::string_view rest = contentOf("/proc/stat");
  const Fields all(takeLine(rest));
  if (all.size() <= kWaiting || all[0] != "cpu") return;
  MachineReading::CpuTicks ticks{0, 0};
  for (std::size_t i = 1; i < all.size() && i <= kStolen; ++i) {
    const auto part = numberOf<std::uint64_t>(all[i]);
    if (!part || __builtin_add_overflow(ticks.total, *part, &ticks.total)) return;
    if (i != kIdle && i != kWaiting) ticks.busy += *part;
  }
  reading.cpu = ticks;
  while (takeLine(rest).starts_with("cpu"))
    ++reading.cpus;
}

void MachineSources::readMemory(MachineReading& reading) {
  std::string_view rest = contentOf("/proc/meminfo");
  std::optional<std::uint64_t> swapTotal;
  std::optional<std::uint64_t> swapFree;
  while (!rest.empty()) {
    const Fields fields(takeLine(rest));
    if (fields.size() < 2) continue;
    const auto kib = numberOf<std::uint64_t>(fields[1]);
    if (fields[0] == "MemTotal:") reading.memoryTotalKib = kib;
    if (fields[0] == "MemAvailable:") reading.memoryAvailableKib = kib;
    if (fields[0] == "SwapTotal:") swapTotal = kib;
    if (fields[0] == "SwapFree:") swapFree = kib;
  }
  if (reading.memoryTotalKib && reading.memoryAvailableKib > reading.memoryTotalKib)
    reading.memoryAvailableKib.reset();
  if (swapTotal && swapFree && *swapFree <= *swapTotal)
    reading.swapUsedKib = *swapTotal - *swapFree;
}

// "  eth0: bytes packets errs drop fifo frame compressed multicast bytes ...", after two lines of
// titles.
std::optional<MachineReading::Traffic> MachineSources::readNetwork() {
  constexpr std::size_t kReceived = 0;
  constexpr std::size_t kSent = 8;
  std::string_view rest = contentOf("/proc/net/dev");
  takeLine(rest);
  takeLine(rest);
  std::optional<MachineReading::Traffic> traffic;
  while (!rest.empty()) {
    const std::string_view line = takeLine(rest);
    const auto colon = line.find(':');
    if (colon == std::string_view::npos) continue;
    const Fields name(line.substr(0, colon));
    const Fields fields(line.substr(colon + 1));
    if (name.size() != 1 || name[0] == "lo" || fields.size() <= kSent) continue;
    addDevice(traffic, numberOf<std::uint64_t>(fields[kReceived]),
              numberOf<std::uint64_t>(fields[kSent]));
  }
  return traffic;
}

// "major minor name reads merged sectors ms writes merged sectors ...", sectors of 512 bytes.
std::optional<MachineReading::Traffic> MachineSources::readDisks() {
  constexpr std::size_t kName = 2;
  constexpr std::size_t kRead = 5;
  constexpr std::size_t kWritten = 9;
  const auto bytesOf = [](std::string_view sectors) {
    const auto count = numberOf<std::uint64_t>(sectors);
    return count ? checkedMultiply(*count, 512) : std::nullopt;
  };
  std::string_view rest = contentOf("/proc/diskstats");
  std::optional<MachineReading::Traffic> traffic;
  while (!rest.empty()) {
    const Fields fields(takeLine(rest));
    if (fields.size() <= kWritten) continue;
    if (!isDisk(fields[kName])) continue;
    addDevice(traffic, bytesOf(fields[kRead]), bytesOf(fields[kWritten]));
  }
  return traffic;
}

// Thermal zones report thousandths of a degree. A driver may keep their reader waiting for ever.
std::optional<double> MachineSources::readTemperature() {
  const std::string folder = root_.pathOrMachine("/sys/class/thermal");
  std::vector<std::shared_ptr<live::SlowFile>> files;
  const int code = walkFolder(folder, [&](const dirent& entry) {
    const std::string name = entry.d_name;
    if (!name.starts_with("thermal_zone")) return true;
    auto& file = zones_[name];
    if (!file) file = std::make_shared<live::SlowFile>(folder + '/' + name + "/temp", false);
    files.push_back(file);
    return true;
  });
  if (code != 0) return std::nullopt;
  std::optional<double> hottest;
  for (const auto& [text, isGone] : sensors_.read(std::move(files))) {
    const auto thousandths = firstNumber<std::int64_t>(trimmed(text.value_or("")));
    if (!thousandths) continue;
    const double celsius = static_cast<double>(*thousandths) / 1000;
    if (!hottest || celsius > *hottest) hottest = celsius;
  }
  return hottest;
}

MachineReading MachineSources::read(Processes processes) {
  MachineReading reading;
  reading.uptimeSeconds = firstNumber<double>(contentOf("/proc/uptime"));
  reading.loadOfOneMinute = firstNumber<double>(contentOf("/proc/loadavg"));
  if (processes == Processes::Counted) reading.processes = countProcesses(root_);
  readCpu(reading);
  readMemory(reading);
  reading.network = readNetwork();
  reading.disk = readDisks();
  reading.celsius = readTemperature();
  readDataFolder(root_, reading);
  return reading;
}

std::int64_t ticksPerSecond() {
  const long ticks = sysconf(_SC_CLK_TCK);
  return ticks > 0 ? ticks : 100;
}

}  // namespace tavrel
