#include "storage/nand_info.h"

#include <algorithm>
#include <cstdint>
#include <iterator>
#include <optional>
#include <string>
#include <string_view>

#include "platform/persisted_state.h"
#include "storage/fetch_statistics.h"
#include "storage/key_map.h"
#include "storage/nand_info_keys.h"

namespace tavrel {
namespace {

// Buffers of older versions contain only the first figures.
constexpr std::uint32_t kFirstFullExportVersion = 0x20002;

constexpr std::uint64_t kSecondsTo2000 = 946684800;  // since 1970
constexpr std::uint64_t kSecondsPerWeek = 604800;

constexpr std::uint64_t kNotSeen = 0xFFFFFFFF;

/// Figures that combine several statistics.
struct Figures {
  std::uint64_t userPartitionStart = kNotSeen;
  std::uint64_t intermediatePartitionStart = kNotSeen;
  std::uint64_t maintenanceRequests = 0;
  std::uint64_t failedReads = 0;
  std::uint64_t failedPrograms = 0;
  std::uint64_t failedErases = 0;
};

enum class Gather : std::uint8_t { Last, Sum, CountOfNonZero };

struct FigureRow {
  std::string_view name;
  std::uint64_t Figures::*figure;
  Gather gather;
};

constexpr FigureRow kFigureRows[] = {
    {"userPartitionStart", &Figures::userPartitionStart, Gather::Last},
    {"intermediatePartitionStart", &Figures::intermediatePartitionStart, Gather::Last},
    {"numBootBlockRefreshSuccess0", &Figures::maintenanceRequests, Gather::Sum},
    {"numBootBlockRefreshFail0", &Figures::maintenanceRequests, Gather::Sum},
    {"mspBootBlockReadFail0", &Figures::failedReads, Gather::CountOfNonZero},
    {"mspBootBlockReadFail1", &Figures::failedReads, Gather::CountOfNonZero},
    {"mspBootBlockReadFail2", &Figures::failedReads, Gather::CountOfNonZero},
    {"mspBootBlockProgFail0", &Figures::failedPrograms, Gather::CountOfNonZero},
    {"mspBootBlockProgFail1", &Figures::failedPrograms, Gather::CountOfNonZero},
    {"mspBootBlockProgFail2", &Figures::failedPrograms, Gather::CountOfNonZero},
    {"mspBootBlockEraseFail0", &Figures::failedErases, Gather::CountOfNonZero},
    {"mspBootBlockEraseFail1", &Figures::failedErases, Gather::CountOfNonZero},
    {"mspBootBlockEraseFail2", &Figures::failedErases, Gather::CountOfNonZero},
};

plist::Dictionary errorInfo(std::string_view message) {
  return {{kNANDInfoErrorKey, "1"}, {kNANDInfoErrorMessageKey, message}};
}

void set32(plist::Dictionary& info, std::string_view key, std::uint32_t value) {
  info.set(key, static_cast<std::int32_t>(value));
}

void set64(plist::Dictionary& info, std::string_view key, std::uint64_t value) {
  info.set(key, static_cast<std::int64_t>(value));
}

bool isDemoDevice(Preferences& preferences) {
  bool exists = false;
  const bool value =
      preferences.ZTXPreferencesGetBoolValue(kStoreDemoModeKey, kDemoDomain, &exists);
  return exists && value;
}

void setVersions(plist::Dictionary& info, Preferences& preferences, const ASPContext& context) {
  set32(info, kNANDInfoExportVersionKey, context.exportVersion);
  set32(info, kNANDInfoDriverVersionKey, context.driverVersion);
  set64(info, kNANDInfoDemoModeKey, isDemoDevice(preferences) ? 1 : 0);
}

void setBasics(plist::Dictionary& info, const ASPContext& context) {
  set32(info, kNANDInfoNumVirtualBlocksKey, context.numVirtualBlocks);
  set32(info, kNANDInfoPagesPerVirtualBlockKey, context.pagesPerVirtualBlock);
  set32(info, kNANDInfoBytesPerPageKey, context.bytesPerPage);
  set64(info, kNANDInfoNumLogicalReadsKey, context.hostReads);
  set64(info, kNANDInfoNumLogicalWritesKey, context.hostWrites);
  set64(info, kNANDInfoNumFreeVirtualBlocksKey, context.numFreeVirtualBlocks);
  set64(info, kNANDInfoNumWearLevelOpsKey, context.wearLevMoves);
  set64(info, kNANDInfoNumPhysicalReadsKey, context.nandReads);
  set64(info, kNANDInfoNumPhysicalWritesKey, context.nandWrites);
  set64(info, kNANDInfoNumPhysicalErasesKey, context.bandErases);
  set64(info, kNANDInfoNumNodesFreeKey, context.IND_pool_free);
  set64(info, kNANDInfoNumNodesTotalKey, context.IND_pool_count);
}

std::uint64_t weeksSince2000(std::uint64_t secondsSince1970) {
  if (secondsSince1970 <= kSecondsTo2000) return 0;
  return (secondsSince1970 - kSecondsTo2000) / kSecondsPerWeek;
}

void setWear(plist::Dictionary& info, const ASPContext& context) {
  set64(info, kNANDInfoFormatWeeksSince2000Key, weeksSince2000(context.utilFormatTime));
  set64(info, kNANDInfoNumSleepOpsKey, context.numSleepOps);
  set64(info, kNANDInfoHighEnduranceBlockEraseCountKey, context.maxHighEnduranceBlockErases);
  set32(info, kNANDInfoBlocksPerVirtualBlock, context.blocksPerVirtualBlock);
  static_assert(std::size(kNANDInfoReadsBeforeErasureKeys) ==
                std::tuple_size_v<decltype(ASPContext::readCountHisto)>);
  for (std::size_t i = 0; i < context.readCountHisto.size(); ++i)
    set64(info, kNANDInfoReadsBeforeErasureKeys[i], context.readCountHisto[i]);
}

// Adds a statistic to the figure that it belongs to, if there is one.
bool gather(Figures& figures, std::string_view name, std::uint64_t value) {
  const auto row = std::ranges::find(kFigureRows, name, &FigureRow::name);
  if (row == std::end(kFigureRows)) return false;
  std::uint64_t& figure = figures.*row->figure;
  switch (row->gather) {
    case Gather::Last:
      figure = value;
      break;
    case Gather::Sum:
      figure += value;
      break;
    case Gather::CountOfNonZero:
      figure += value != 0;
      break;
  }
  return true;
}

// Sets the statistics that have a key of their own, and combines the others into figures.
Figures setStatistics(plist::Dictionary& info, const ASPContext& context) {
  Figures figures;
  std::string key(kNANDInfoKeyPrefix);
  forEachStatistic(context, [&](std::string_view name, const ASPValueEntry& entry) {
    if (gather(figures, name, entry.value)) return;
    const KeyMapRow* const row = findKeyMapRow(name);
    if (!row) return;
    key.resize(kNANDInfoKeyPrefix.size());
    key += row->suffix;
    const bool isMaximum = name == "maxMemLowDuration" || name == "maxMemChokeDuration";
    info.set(key, isMaximum ? roundMaximumDuration(entry.value)
                            : static_cast<std::int64_t>(entry.value));
  });
  return figures;
}

void setFigures(plist::Dictionary& info, const Figures& figures) {
  if (figures.userPartitionStart != kNotSeen && figures.intermediatePartitionStart != kNotSeen) {
    set64(info, kNANDInfoIntermediatePartitionSizeKey,
          figures.userPartitionStart - figures.intermediatePartitionStart);
  }
  set64(info, kNANDInfoNumMaintenanceRequestsKey, figures.maintenanceRequests);
  set64(info, kNANDInfoMaintenanceFailedReadKey, figures.failedReads);
  set64(info, kNANDInfoMaintenanceFailedProgKey, figures.failedPrograms);
  set64(info, kNANDInfoMaintenanceFailedEraseKey, figures.failedErases);
}

}  // namespace

// Counts digits with integers, because the C library's log10 need not be exact on every CPU.
std::int64_t roundMaximumDuration(std::uint64_t value) {
  const auto x = static_cast<std::uint32_t>(value);
  if (x < 100) return x;
  std::uint32_t power = 1;  // x / power has three digits
  while (x / power >= 1000)
    power *= 10;
  std::uint32_t figures = x / power;
  // For a value of three digits, power is 1 and half of it 0, so the result is one higher.
  if (x - figures * power >= power / 2) ++figures;
  return std::int64_t{figures} * power;
}

plist::Dictionary buildNANDInfo(Preferences& preferences, const ASPContext& context, bool logMode) {
  if (context.exportVersion == 0) {
    return logMode ? plist::Dictionary() : errorInfo("Unsupported export version");
  }
  auto info = plist::Dictionary::create(keyMap.size() + 32);
  if (!logMode) setVersions(info, preferences, context);
  setBasics(info, context);
  if (context.exportVersion < kFirstFullExportVersion) return info;
  setWear(info, context);
  setFigures(info, setStatistics(info, context));
  return info;
}

namespace {

/// Nothing when the statistics cannot be fetched.
std::optional<plist::Dictionary> fetchNANDInfo(Platform& platform, bool logMode) {
  ASPContext context;
  const NandExporter* exporter = nullptr;
  if (!fetchStatistics(platform.drivers, platform.standardStreams, exporter, context)) {
    return std::nullopt;
  }
  auto info = buildNANDInfo(platform.preferences, context, logMode);
  if (exporter->release) exporter->release(context);
  return info;
}

}  // namespace

void CopyDictionary(const plist::String& key, const plist::Value& value,
                    plist::Dictionary& target) {
  target.set(key, value);
}

plist::Dictionary CopyNANDInfo(Platform& platform) {
  return fetchNANDInfo(platform, false).value_or(errorInfo("Unable to parse buffer"));
}

void DumpNANDInfo(Platform& platform, plist::Dictionary& target) {
  const auto info = fetchNANDInfo(platform, true);
  if (!info) return;
  for (const plist::Entry& entry : *info)
    CopyDictionary(entry.key, entry.value, target);
}

}  // namespace tavrel
