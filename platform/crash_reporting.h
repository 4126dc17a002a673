// The crash-reporting support service: structured records, and the identity of the device.
#pragma once

#include <cstdint>
#include <string>

#include "base/plist.h"

namespace tavrel {

class CrashReporting {
 public:
  virtual ~CrashReporting() = default;

  /// Files one structured diagnostic record under a numeric log type.
  virtual void FLLogStructuredData(std::uint32_t logType, const plist::Dictionary& record) = 0;

  /// Removes structured-data logs by age.
  virtual void FLDumpAllOldStructuredDataLogs() = 0;

  /// Rolls the support log over.
  virtual void rollNorvaneCareLogs() = 0;

  virtual std::string systemIdentifier() = 0;
  virtual std::string hardwareModel() = 0;
  /// "name version (build)".
  virtual std::string osVersion() = 0;
  /// A new identifier for each call.
  virtual std::string incidentIdentifier() = 0;
};

}  // namespace tavrel
