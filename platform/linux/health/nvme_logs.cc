#include "platform/linux/health/nvme_logs.h"

#include <algorithm>
#include <array>

#include "base/format.h"
#include "platform/linux/health/log_page.h"

namespace tavrel::health {
namespace {

// A data unit is a thousand blocks of 512 bytes, and the drive rounds up.
constexpr std::uint32_t kDataUnit = 512'000;
constexpr auto kNotACounter = Resets::NotACounter;
constexpr auto kNever = Resets::Never;
constexpr Place percentage(std::uint16_t offset) {
  return {.offset = offset, .width = 1, .largest = 100};
}

constexpr FigureKind kSmart[] = {
    {"critical_warning",
     kPlain,
     kNotACounter,
     "log 02h byte 0",
     "bit mask: 1 spare low, 2 temperature, 4 unreliable, 8 read-only, 16 no backup power",
     {0, 1}},
    // Kelvin in the log.
    {"temperature",
     kMillidegrees,
     kNotACounter,
     "log 02h bytes 1-2",
     "composite temperature",
     {1, 2, 1000, true}},
    {"spare_pct", kPlain, kNotACounter, "log 02h byte 3", "spare left", percentage(3)},
    {"spare_threshold_pct", kPlain, kNotACounter, "log 02h byte 4",
     "spare below which the drive warns", percentage(4)},
    {"used_pct", kPlain, kNotACounter, "log 02h byte 5", "endurance used, may pass 100", {5, 1}},
    {"read", kBytes, kNever, "log 02h bytes 32-47", "read by the host", {32, 16, kDataUnit, true}},
    {"written",
     kBytes,
     kNever,
     "log 02h bytes 48-63",
     "written by the host",
     {48, 16, kDataUnit, true}},
    {"read_commands",
     kEvents,
     kNever,
     "log 02h bytes 64-79",
     "read and compare commands",
     {64, 16}},
    {"write_commands", kEvents, kNever, "log 02h bytes 80-95", "write commands", {80, 16}},
    {"busy_minutes",
     kPlain,
     kNever,
     "log 02h bytes 96-111",
     "time with commands outstanding",
     {96, 16}},
    {"power_cycles", kEvents, kNever, "log 02h bytes 112-127", "power cycles", {112, 16}},
    {"power_on_hours",
     kPlain,
     kNever,
     "log 02h bytes 128-143",
     "time under power; may leave out low-power states",
     {128, 16}},
    {"unsafe_shutdowns",
     kEvents,
     kNever,
     "log 02h bytes 144-159",
     "power losses without notice",
     {144, 16}},
    {"media_errors",
     kEvents,
     kNever,
     "log 02h bytes 160-175",
     "unrecovered errors of data integrity",
     {160, 16}},
    {"error_log_entries",
     kEvents,
     kNever,
     "log 02h bytes 176-191",
     "entries ever made in the error log",
     {176, 16}},
    {"warning_temp_minutes",
     kPlain,
     kNever,
     "log 02h bytes 192-195",
     "time above the warning temperature",
     {192, 4}},
    {"critical_temp_minutes",
     kPlain,
     kNever,
     "log 02h bytes 196-199",
     "time above the critical temperature",
     {196, 4}},
    {"throttle_light",
     kEvents,
     kNever,
     "log 02h bytes 216-219",
     "transitions to light thermal throttling",
     {216, 4}},
    {"throttle_heavy",
     kEvents,
     kNever,
     "log 02h bytes 220-223",
     "transitions to heavy thermal throttling",
     {220, 4}},
};

constexpr FigureKind kOcp[] = {
    {"media_written", kBytes, kNever, "log C0h bytes 0-15", "written to the media", {0, 16}},
    {"media_read", kBytes, kNever, "log C0h bytes 16-31", "read from the media", {16, 16}},
    {"bad_user_blocks", kEvents, kNever, "log C0h bytes 32-37", "retired user blocks", {32, 6}},
    {"bad_system_blocks", kEvents, kNever, "log C0h bytes 40-45", "retired system blocks", {40, 6}},
    {"xor_recoveries", kEvents, kNever, "log C0h bytes 48-55", "data recovered by parity", {48, 8}},
    {"uncorrectable_reads", kEvents, kNever, "log C0h bytes 56-63", "uncorrectable reads", {56, 8}},
    {"soft_ecc_errors",
     kEvents,
     kNever,
     "log C0h bytes 64-71",
     "reads that needed more than the first correction",
     {64, 8}},
    {"e2e_errors",
     kEvents,
     kNever,
     "log C0h bytes 72-75",
     "end-to-end errors detected, corrected ones included",
     {72, 4}},
    {"refreshed_blocks",
     kEvents,
     kNever,
     "log C0h bytes 81-87",
     "blocks rewritten to refresh",
     {81, 7}},
    {"erases_max",
     kEvents,
     kNever,
     "log C0h bytes 88-91",
     "erasures of the most used block",
     {88, 4}},
    {"erases_min",
     kEvents,
     kNever,
     "log C0h bytes 92-95",
     "erasures of the least used block",
     {92, 4}},
    {"throttle_events",
     kEvents,
     kNotACounter,
     "log C0h byte 96",
     "thermal throttling events; one byte that stays at 255",
     {96, 1}},
    {"free_pct", kPlain, kNotACounter, "log C0h byte 120", "free blocks", percentage(120)},
    {"system_used_pct",
     kPlain,
     kNotACounter,
     "log C0h byte 80",
     "endurance of the system area used",
     {80, 1}},
    {"pcie_errors",
     kEvents,
     kNever,
     "log C0h bytes 104-111",
     "corrected errors of the bus",
     {104, 8}},
    {"incomplete_shutdowns",
     kEvents,
     kNever,
     "log C0h bytes 112-115",
     "shutdowns that did not save everything",
     {112, 4}},
    {"capacitor_pct",
     kPlain,
     kNotACounter,
     "log C0h bytes 128-129",
     "health of the backup capacitor, may pass 100",
     {128, 2}},
    {"unaligned_io",
     kEvents,
     kNever,
     "log C0h bytes 136-143",
     "commands that were not aligned",
     {136, 8}},
    // From here on: only in version 2 of the log.
    {"backup_power_starts",
     kEvents,
     kNever,
     "log C0h bytes 160-175",
     "times that the drive ran on its capacitor",
     {160, 16}},
    {"endurance",
     kBytes,
     kNotACounter,
     "log C0h bytes 176-191",
     "bytes that the drive is expected to take in its life",
     {176, 16, 1, true}},
    {"link_retrains",
     kEvents,
     kNever,
     "log C0h bytes 192-199",
     "retrainings of the bus link",
     {192, 8}},
    {"power_state_changes",
     kEvents,
     kNever,
     "log C0h bytes 200-207",
     "changes of power state",
     {200, 8}},
};

constexpr std::size_t kOcpOfVersion1 = std::size(kOcp) - 4;

constexpr FigureKind kDerived[] = {
    {"waf_milli", kPlain, kNotACounter, "logs 02h and C0h",
     "write amplification: media_written / written, in thousandths"},
};

constexpr std::size_t kOcpVersionOffset = 494;
constexpr std::size_t kOcpGuidOffset = 496;
constexpr std::array<std::uint8_t, 16> kOcpGuid = {0xC5, 0xAF, 0x10, 0x28, 0xEA, 0xBF, 0xF2, 0xA4,
                                                   0x9C, 0x4F, 0x6F, 0x7C, 0xC9, 0x14, 0xD5, 0xAF};
constexpr std::int64_t kZeroCelsius = 273'150;  // thousandths of a Kelvin

Status checkPage(ByteSpan page, std::string_view name) {
  if (page.empty()) return Error{format("the drive has no log %s", name)};
  if (page.size() != kNvmeLogBytes) {
    return Error{format("log %s has %zu bytes instead of %zu", name, page.size(), kNvmeLogBytes)};
  }
  if (isBlank(page)) return Error{format("log %s is blank", name)};
  return Done{};
}

}  // namespace

std::span<const FigureKind> nvmeSmartKinds() {
  return kSmart;
}
std::span<const FigureKind> nvmeOcpKinds() {
  return kOcp;
}
std::span<const FigureKind> nvmeDerivedKinds() {
  return kDerived;
}

Expected<Figures> nvmeSmartFigures(ByteSpan page) {
  if (const Status usable = checkPage(page, "02h"); !usable) return usable.error();
  Figures figures;
  appendFields(page, kSmart, figures);
  for (Figure& figure : figures) {
    if (figure.kind->unit == kMillidegrees) figure.value -= kZeroCelsius;
  }
  return figures;
}

Expected<Figures> nvmeOcpFigures(ByteSpan page) {
  if (const Status usable = checkPage(page, "C0h"); !usable) return usable.error();
  const bool hasGuid = std::ranges::equal(
      page.subspan(kOcpGuidOffset, kOcpGuid.size()), kOcpGuid,
      [](std::byte a, std::uint8_t b) { return std::to_integer<std::uint8_t>(a) == b; });
  if (!hasGuid) return Error{"log C0h is not the one of OCP"};
  Figures figures;
  const bool isFirst = *loadLittle16(page, kOcpVersionOffset) < 2;
  appendFields(page, std::span(kOcp).first(isFirst ? kOcpOfVersion1 : std::size(kOcp)), figures);
  return figures;
}

void appendNvmeDerived(Figures& figures) {
  const std::int64_t* const media = valueOf(figures, "media_written");
  const std::int64_t* const host = valueOf(figures, "written");
  if (media == nullptr || host == nullptr || *host == 0) return;
  const double ratio = static_cast<double>(*media) / static_cast<double>(*host);
  figures.push_back({kDerived, static_cast<std::int64_t>(ratio * 1000)});
}

}  // namespace tavrel::health
