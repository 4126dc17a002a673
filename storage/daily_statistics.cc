#include "storage/daily_statistics.h"

#include <algorithm>
#include <array>
#include <cstdint>
#include <optional>

#include "base/bytes.h"
#include "base/format.h"
#include "ioreport/ioreport.h"
#include "platform/guarded.h"
#include "storage/nand_info.h"
#include "storage/nand_info_keys.h"
#include "storage/structured_log.h"
#include "storage/structured_record_type.h"

namespace tavrel {
namespace {

constexpr std::int64_t kUnknown = -1;
constexpr int kMebibyteShift = 20;

std::int64_t mebibytes(const std::optional<plist::Number>& bytes) {
  return bytes ? bytes->int64() >> kMebibyteShift : kUnknown;
}

void reportDiskUsage(Platform& platform) {
  const plist::Dictionary usage = platform.deviceAnswers->SQCopyAnswer("DiskUsage").dictionary();
  const std::int64_t capacity = mebibytes(usage.number(kSQQDiskUsageTotalDiskCapacity));
  const std::int64_t available = mebibytes(usage.number(kSQQDiskUsageTotalDataAvailable));
  StatisticsStore& store = platform.statistics;
  store.BHClientSetValueForScalarKey("com.norvane.lumenhall.DiskUsageUserTotalBlocks", capacity);
  store.BHClientSetValueForScalarKey("com.norvane.lumenhall.DiskUsageUserBlocksFree", available);
}

void reportNANDInfoScalars(Platform& platform) {
  DumpStorageStructuredLog(platform, false);
  const plist::Dictionary info = CopyNANDInfo(platform);
  if (!info) {
    platform.log->log(LogLevel::Default, "failed to get NAND info dict");
    return;
  }
  if (info.contains(kNANDInfoErrorKey)) {
    platform.log->log(LogLevel::Default, "error reading nand info, error %@ with message %@",
                      info.get(kNANDInfoErrorKey), info.get(kNANDInfoErrorMessageKey));
    return;
  }
  for (const auto& [key, value] : info) {
    if (const auto number = value.number()) {
      platform.statistics->BHClientSetValueForScalarKey(key, number->int64());
    }
  }
}

// -- ECC events ---------------------------------------------------------------------------------

// The kernel's record: the event's identifier and its count of registers (a byte each), 6 ignored
// bytes, and the registers, 64 bits each, little-endian.
constexpr std::uint64_t kEventID = 0;
constexpr std::uint64_t kRegisterCount = 1;
constexpr std::uint64_t kRegisters = 8;
constexpr std::uint8_t kMostRegisters = 8;
using ECCEventRecord = std::array<std::byte, 72>;

constexpr int kMostEventsLogged = 10;

/// Errors that mean only that there is nothing to read now.
constexpr int kNoSuchEntry = 2;
constexpr int kBusy = 16;

plist::Dictionary dictionaryOf(const ECCEventRecord& event) {
  const std::uint8_t registers = std::min(*loadByte(event, kRegisterCount), kMostRegisters);
  plist::Dictionary record{{"id", *loadByte(event, kEventID)}, {"count", registers}};
  for (std::uint8_t i = 0; i < registers; ++i) {
    const std::uint64_t value = *loadLittle64(event, kRegisters + i * sizeof(std::uint64_t));
    record.set(format("reg%d", i), static_cast<std::int64_t>(value));
  }
  return record;
}

void reportECCEvents(Platform& platform) {
  ECCEventRecord event{};
  const auto readNext = [&] {
    return platform.systemControls->read("kern.next_ecc_event", event).errorNumber;
  };
  int error = readNext();
  for (int logged = 0; error == 0 && logged < kMostEventsLogged; ++logged) {
    platform.crashReporting->FLLogStructuredData(kEccRecordType, dictionaryOf(event));
    error = readNext();
  }
  // Also logged, with errno 0, when the limit leaves events over: the last one read is not filed.
  if (error != kNoSuchEntry && error != kBusy) {
    platform.log->log(LogLevel::Default, "Unexpected errno (%d) reading ECC events from kernel",
                      error);
  }
}

// -- Report channels ----------------------------------------------------------------------------

constexpr std::uint16_t kStorageCategory = 0x0100;

bool isSimple(const plist::Dictionary& channel) {
  return IOReportChannelGetFormat(channel) == kFormatSimple;
}

void reportChannels(Platform& platform) {
  const plist::Dictionary channels = IOReportCopyChannelsInCategories(
      platform.drivers, platform.standardStreams, kStorageCategory, kOptionGroupByDriver, nullptr);
  if (!channels) return;
  IOReportPrune(channels, [](const plist::Dictionary& channel) {
    return isSimple(channel) ? kIterateContinue : kIterateRemove;
  });

  plist::Dictionary subscribed;
  const auto subscription =
      IOReportCreateSubscription(platform.drivers, nullptr, channels, &subscribed, 0, nullptr);
  if (!subscription) return;
  const plist::Dictionary samples = IOReportCreateSamples(subscription.get(), subscribed, nullptr);
  if (!samples) return;
  IOReportIterate(samples, [&platform](const plist::Dictionary& channel) {
    if (isSimple(channel)) {
      platform.statistics->BHClientSetValueForScalarKey(
          format("com.norvane.ioreport.%@", textOrNull(IOReportChannelGetChannelName(channel))),
          IOReportSimpleGetIntegerValue(channel));
    }
    return kIterateContinue;
  });
}

struct StorageStep {
  const char* name;
  const char* purpose;  // completes "cannot ..." when an exception ends the step
  void (*run)(Platform& platform);
};

constexpr StorageStep kSteps[] = {
    {"Disk space", "report the disk space", reportDiskUsage},
    {"Structured storage log and NAND information", "finish the storage log and NAND information",
     reportNANDInfoScalars},
    {"ECC events", "finish filing ECC events", reportECCEvents},
    {"Report channels", "finish reading report channels", reportChannels},
};

}  // namespace

void dailyStorageStatistics(Platform& platform, const StepObserver& onStep) {
  for (const StorageStep& step : kSteps) {
    beginStep(onStep, step.name);
    runGuarded(platform.log, step.purpose, [&] { step.run(platform); });
  }
}

}  // namespace tavrel
