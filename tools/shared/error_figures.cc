#include "tools/shared/error_figures.h"

#include <algorithm>
#include <iterator>

namespace tavrel {
namespace {

constexpr std::string_view kNandPrefix = "com.norvane.NANDInfo.";

// Prefixes of keys.
constexpr std::string_view kErrorFigures[] = {
    "FailedReconstruction",
    "raidFailed",
    "InvalidParity",
    "MetaMismatchReread",
    "AbortSkip_",
    "E2E_",
    "numCrossTempUecc",
    "BitFlip",
    "MaintenanceRequestsFailed",
    "openBandReadFail",
    "com.norvane.zentrix.bhd.database.corruptions",
};

}  // namespace

bool isErrorFigure(std::string_view key) {
  if (key.starts_with(kNandPrefix)) key.remove_prefix(kNandPrefix.size());
  return std::any_of(std::begin(kErrorFigures), std::end(kErrorFigures),
                     [key](std::string_view begin) { return key.starts_with(begin); });
}

}  // namespace tavrel
