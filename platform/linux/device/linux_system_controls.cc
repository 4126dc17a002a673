#include "platform/linux/device/linux_system_controls.h"

#include <algorithm>
#include <cerrno>
#include <sys/sysinfo.h>
#include <unistd.h>

#include "platform/linux/files/property_list_file.h"

namespace tavrel {
namespace {

constexpr std::string_view kControlsPath = "/etc/tavrel/system-controls.plist";

/// The kernel's largest error number.
constexpr std::int64_t kLargestControlError = 4095;

SystemControls::Result give(ByteSpan value, MutableByteSpan buffer) {
  if (value.size() > buffer.size()) return {ENOMEM, 0};
  std::copy(value.begin(), value.end(), buffer.begin());
  return {0, value.size()};
}

/// Stores the number over the whole buffer, which is longer than a number when a record is read.
SystemControls::Result give(const plist::Number& number, MutableByteSpan buffer) {
  const std::int64_t value = number.int64();
  const auto word = static_cast<std::uint64_t>(value);
  const bool isNegative = number.kind() != plist::NumberKind::UInt64 && value < 0;
  const std::size_t bits = 8 * buffer.size();
  if (bits == 0) return {ENOMEM, 0};
  if (bits < 64 && (isNegative ? value >> (bits - 1) != -1 : word >> bits != 0)) {
    return {ENOMEM, 0};
  }
  const std::uint64_t extension = isNegative ? 0xff : 0;
  for (std::size_t i = 0; i < buffer.size(); ++i) {
    const std::uint64_t rest = i < sizeof(word) ? word >> (8 * i) : extension;
    buffer[i] = static_cast<std::byte>(rest & 0xff);
  }
  return {0, buffer.size()};
}

SystemControls::Result swapUsage(MutableByteSpan buffer) {
  struct sysinfo info {};
  if (sysinfo(&info) != 0) return {errno, 0};
  const std::uint64_t unit = std::max(info.mem_unit, 1U);
  return give(swapUsageRecord(info.totalswap * unit, info.freeswap * unit,
                              static_cast<std::uint32_t>(sysconf(_SC_PAGESIZE))),
              buffer);
}

}  // namespace

std::array<std::byte, kSwapUsageBytes> swapUsageRecord(std::uint64_t total, std::uint64_t available,
                                                       std::uint32_t pageSize) {
  std::array<std::byte, kSwapUsageBytes> record{};
  storeLittle64(record, 0, total);
  storeLittle64(record, 8, available);
  storeLittle64(record, 16, total - std::min(available, total));
  storeLittle32(record, 24, pageSize);
  return record;
}

SystemControls::Result LinuxSystemControls::read(std::string_view name, MutableByteSpan buffer) {
  if (!recorded_)
    recorded_ = readDictionaryFile(files_, propertyLists_, log_, root_.path(kControlsPath));
  if (const plist::Value recorded = recorded_->get(name)) return answer(name, recorded, buffer);
  if (name == "vm.swapusage") return swapUsage(buffer);
  if (name == "kern.next_ecc_event") return eccEvents_.next(buffer);
  return {ENOENT, 0};
}

SystemControls::Result LinuxSystemControls::answer(std::string_view name,
                                                   const plist::Value& recorded,
                                                   MutableByteSpan buffer) {
  if (const auto bytes = recorded.data()) return give(bytes.bytes(), buffer);
  if (const auto number = recorded.number(); number && !number->isFloating()) {
    return give(*number, buffer);
  }
  if (const auto code = recorded.dictionary().number("errno");
      code && code->int64() > 0 && code->int64() <= kLargestControlError) {
    return {code->int32(), 0};
  }
  log_.log(LogLevel::Error,
           "%s: the value of %s is neither bytes nor an integer nor {\"errno\": NUMBER}",
           root_.path(kControlsPath), name);
  return {EINVAL, 0};
}

}  // namespace tavrel
