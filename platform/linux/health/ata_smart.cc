#include "platform/linux/health/ata_smart.h"

#include <algorithm>
#include <limits>
#include <memory>

#include "platform/linux/health/ata_library.h"

namespace tavrel::health {
namespace {

enum Row : std::size_t {
  kGood,
  kTemperature,
  kPowerOn,
  kPowerCycles,
  kBad,
  kReallocated,
  kPending,
  kCrcErrors,
  kFailing
};
constexpr FigureKind kKinds[] = {
    {"smart_good", kPlain, Resets::NotACounter, "SMART RETURN STATUS", "1 good, 0 failing"},
    {"temperature", kMillidegrees, Resets::NotACounter, "attribute 194 or 231", "temperature"},
    {"power_on_hours", kPlain, Resets::Never, "attribute 9", "time under power"},
    {"power_cycles", kEvents, Resets::Never, "attribute 12", "power cycles"},
    {"bad_sectors", kEvents, Resets::NotACounter, "attributes 5 and 197",
     "reallocated sectors, and those that wait for reallocation"},
    {"reallocated_sectors", kEvents, Resets::Never, "attribute 5", "reallocated sectors"},
    {"pending_sectors", kEvents, Resets::NotACounter, "attribute 197",
     "unstable sectors that wait for reallocation"},
    {"crc_errors", kEvents, Resets::Never, "attribute 199", "errors on the cable"},
    {"failing_attributes", kEvents, Resets::NotACounter, "all attributes",
     "pre-failure attributes at or below their thresholds"},
};
constexpr std::uint64_t kMillisecondsPerHour = 3'600'000;
constexpr std::uint64_t kZeroCelsius = 273'150;

struct Collected {
  Figures figures;
  std::int64_t failing = 0;
  bool hasThresholds = false;

  void add(Row row, std::uint64_t value) {
    constexpr std::uint64_t kLargest = std::numeric_limits<std::int64_t>::max();
    figures.push_back({&kKinds[row], static_cast<std::int64_t>(std::min(value, kLargest))});
  }
};

void takeAttribute(SkDisk*, const SkSmartAttributeParsedData* attribute, void* target) {
  Collected& collected = *static_cast<Collected*>(target);
  if (attribute->threshold_valid) collected.hasThresholds = true;
  if (attribute->prefailure && attribute->good_now_valid && !attribute->good_now) {
    ++collected.failing;
  }
  if (attribute->pretty_unit != SK_SMART_ATTRIBUTE_UNIT_SECTORS &&
      attribute->pretty_unit != SK_SMART_ATTRIBUTE_UNIT_NONE) {
    return;
  }
  if (attribute->id == 5) collected.add(kReallocated, attribute->pretty_value);
  if (attribute->id == 197) collected.add(kPending, attribute->pretty_value);
  if (attribute->id == 199) collected.add(kCrcErrors, attribute->pretty_value);
}

}  // namespace

std::span<const FigureKind> ataKinds() {
  return kKinds;
}

Expected<Figures> ataFigures(ByteSpan blob) {
  const auto library = ataLibrary();
  if (!library) return library.error();
  const AtaLibrary& ata = **library;
  SkDisk* opened = nullptr;
  if (ata.open(nullptr, &opened) != 0) return Error{"cannot take SMART data apart"};
  const std::unique_ptr<SkDisk, decltype(ata.free)> disk(opened, ata.free);
  Collected collected;
  if (ata.set_blob(opened, blob.data(), blob.size()) != 0 ||
      ata.smart_parse_attributes(opened, &takeAttribute, &collected) != 0) {
    return Error{"SMART data is malformed"};
  }
  SkBool good = FALSE;
  if (ata.smart_status(opened, &good) == 0) collected.add(kGood, good ? 1U : 0U);
  std::uint64_t value = 0;
  if (ata.smart_get_temperature(opened, &value) == 0 && value >= kZeroCelsius) {
    collected.add(kTemperature, value - kZeroCelsius);
  }
  if (ata.smart_get_power_on(opened, &value) == 0) {
    collected.add(kPowerOn, value / kMillisecondsPerHour);
  }
  if (ata.smart_get_power_cycle(opened, &value) == 0) collected.add(kPowerCycles, value);
  if (ata.smart_get_bad(opened, &value) == 0) collected.add(kBad, value);
  // Drives may refuse the obsolete command for their thresholds.
  if (collected.hasThresholds)
    collected.add(kFailing, static_cast<std::uint64_t>(collected.failing));
  return std::move(collected.figures);
}

}  // namespace tavrel::health
