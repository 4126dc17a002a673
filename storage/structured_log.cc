#include "storage/structured_log.h"

#include <array>
#include <memory>
#include <new>
#include <optional>
#include <span>

#include "platform/guarded.h"
#include "platform/persisted_state.h"
#include "storage/device_buffer.h"
#include "storage/driver_client.h"
#include "storage/fetch_statistics.h"
#include "storage/nand_exporters.h"
#include "storage/selector_request.h"
#include "storage/structured_lists.h"

namespace tavrel {

double gCurrentUserWamp = 0;
double gCurrentSysWamp = 0;
bool gForceCollectionSet = false;
bool gNeedValidityList = false;

namespace {

/// The validity list is logged above this write amplification, unless a preference sets another
/// threshold.
constexpr double kDefaultThreshold = 2.0;

/// The unit of write amplification in bytes, as a power of two.
constexpr unsigned kUnitShift = 12;

constexpr std::uint8_t kTelemetrySubLists = 3;

struct WriteAmplification {
  float user = 0;
  float intermediate = 0;
};

WriteAmplification amplificationIn(const ASPContext& context) {
  std::uint64_t slcPages = 0;
  std::uint64_t intermediateErases = 0;
  forEachStatistic(context, [&](std::string_view name, const ASPValueEntry& entry) {
    if (name == "pagesPerVirtualBlockSlc") slcPages = entry.value;
    if (name == "intermediateBandErases") intermediateErases = entry.value;
  });
  const auto hostWrites = static_cast<double>(context.hostWrites);
  // Receivers expect the size modulo 2^32.
  const std::uint32_t blockBytes = context.pagesPerVirtualBlock * context.bytesPerPage;
  const std::uint64_t blockUnits = blockBytes >> kUnitShift;
  const std::uint64_t slcUnits = (slcPages * context.bytesPerPage) >> kUnitShift;

  WriteAmplification result;
  result.user =
      static_cast<float>(static_cast<double>(context.bandErases * blockUnits) / hostWrites);
  if (slcUnits != 0 && intermediateErases != 0) {
    result.intermediate =
        static_cast<float>(static_cast<double>(slcUnits * intermediateErases) / hostWrites);
  }
  return result;
}

/// The threshold from the preference; nothing when that is absent or out of range.
std::optional<float> preferredThreshold(Preferences& preferences) {
  const auto number =
      preferences.ZTXPreferencesGetValue(kUserAmplificationKey, kNandInfoDomain).number();
  if (!number || !number->isFloating()) return std::nullopt;
  if (!(number->real() > 0 && number->real() < 10)) return std::nullopt;
  return static_cast<float>(number->real());
}

bool exceedsThreshold(Platform& platform, float userAmplification) {
  if (const auto threshold = preferredThreshold(platform.preferences)) {
    return userAmplification > *threshold;
  }
  return gCurrentUserWamp > kDefaultThreshold;
}

/// Sets the process-wide figures for this run, and decides whether the run logs the validity list.
void measureWriteAmplification(Platform& platform) {
  gCurrentUserWamp = gCurrentSysWamp = 0;
  const std::unique_ptr<ASPContext> context(new (std::nothrow) ASPContext());
  if (!context) {
    platform.standardStreams->writeError("not enough memory?");
    gNeedValidityList = gForceCollectionSet;
    return;
  }
  WriteAmplification amplification;
  const NandExporter* exporter = nullptr;
  if (fetchStatistics(platform.drivers, platform.standardStreams, exporter, *context)) {
    amplification = amplificationIn(*context);
  }
  if (exporter->release) exporter->release(*context);
  gCurrentUserWamp = static_cast<double>(amplification.user);
  gCurrentSysWamp = static_cast<double>(amplification.intermediate);
  gNeedValidityList = gForceCollectionSet || exceedsThreshold(platform, amplification.user);
}

/// One query of a run.
struct SelectorFunction {
  SelectorGetter selectors = nullptr;
  ListCallback callback = nullptr;
  std::uint8_t subList = 0;
};

/// The queries of a run. Lists that a driver does not offer are reported on standard error.
class SelectorFunctions {
 public:
  SelectorFunctions(const NandExporter& exporter, StandardStreams& streams) {
    if (exporter.bandStatistics) {
      add({exporter.bandStatistics, logValidityList, 0});
    } else {
      streams.writeError("Validity list retrieval is not supported\n");
    }
    if (exporter.telemetryList) {
      for (std::uint8_t subList = 0; subList < kTelemetrySubLists; ++subList)
        add({exporter.telemetryList, logTelemetryList, subList});
    } else {
      streams.writeError("Telemetry list retrieval is not supported\n");
    }
    if (exporter.defectsList) {
      add({exporter.defectsList, logDefectsList, 0});
    } else {
      streams.writeError("Defects list retrieval is not supported\n");
    }
  }

  std::span<const SelectorFunction> all() const { return std::span(functions_).first(count_); }

 private:
  void add(const SelectorFunction& function) { functions_[count_++] = function; }

  std::array<SelectorFunction, kTelemetrySubLists + 2> functions_;
  std::size_t count_ = 0;
};

/// Fetches and logs one list. False when it could not be logged; true also when the driver does not
/// deliver it.
bool logList(Platform& platform, UserClient& client, const NandExporter& exporter,
             const SelectorFunction& function, std::int32_t index, bool requestFlag,
             const plist::Value& characteristics) {
  StandardStreams& streams = platform.standardStreams;
  const SelectorTable* const table = function.selectors();
  if (!table) return false;

  const auto sizeRequest = SelectorRequest::sizeQuery(*table, requestFlag, function.subList);
  std::uint32_t size = 0;
  if (const auto status = querySize(client, exporter, sizeRequest.bytes(), size)) {
    streams.printError("IOConnectCallStructMethod failed with status 0x%x on selector index %d\n",
                       status, index);
    return true;
  }
  if (size == 0) return true;
  const DeviceBuffer buffer = DeviceBuffer::allocate(size);
  if (!buffer) {
    streams.printError("Could not malloc %lld bytes", std::int64_t{size});
    return false;
  }
  const auto request = SelectorRequest::fetch(*table, requestFlag, function.subList);
  std::size_t length = 0;
  if (fetchList(client, exporter, request.bytes(), buffer.bytes(), length) != kKernelSuccess) {
    streams.printError("Could not retrieve data from driver for selector %u\n", table->fetch);
    return true;
  }
  // The list is as long as the driver announced, however much it filled in; the rest is 0.
  return function.callback(platform, buffer.bytes(), characteristics);
}

}  // namespace

bool logStorageLists(Platform& platform, DriverService& service, const NandExporter& exporter,
                     bool requestFlag) {
  StandardStreams& streams = platform.standardStreams;
  return withClient(service, streams, [&](UserClient& client) {
    const plist::Value characteristics =
        service.searchProperty("IOService", exporter.characteristicsProperty);
    if (!characteristics) {
      streams.writeError("failed to create dictionary");
      return false;
    }
    const SelectorFunctions functions(exporter, streams);
    bool isLogged = true;
    std::int32_t index = 0;
    for (const SelectorFunction& function : functions.all()) {
      bool isThisLogged = false;
      runGuarded(platform.log, "log a list of the storage driver", [&] {
        isThisLogged =
            logList(platform, client, exporter, function, index, requestFlag, characteristics);
      });
      isLogged &= isThisLogged;
      ++index;
    }
    return isLogged;
  });
}

bool DumpStorageStructuredLog(Platform& platform, bool requestFlag) {
  measureWriteAmplification(platform);
  const NandExporter* exporter = nullptr;
  const auto service = findNandExporter(platform.drivers, exporter);
  if (!service) {
    platform.standardStreams->writeError(
        "Could not get matching Kernkit service for exporting classes\n");
    return false;
  }
  return logStorageLists(platform, *service, *exporter, requestFlag);
}

}  // namespace tavrel
