// One reading of one drive, and its file.
//
//   /run/tavrel/health/nvme0.plist
//     version 1, name, kind, model, firmware, capacity (bytes), time (date), boot (its ID),
//     from ("log 02h"), error (when the drive could not be read), figures and growth: dictionaries
//     from the name of a figure to its value
//
// It has no serial number: everybody may read it.
#pragma once

#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/bytes.h"
#include "base/expected.h"
#include "base/plist.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/health/drives.h"
#include "platform/linux/health/figure.h"

namespace tavrel::health {

inline constexpr std::string_view kReadingsFolder = "/run/tavrel/health";

struct Reading {
  std::string name;
  DriveKind kind = DriveKind::Nvme;
  std::string model, firmware;
  std::optional<std::int64_t> capacity;  // bytes
  std::int64_t time = 0;                 // seconds since 1970
  std::string boot;
  std::string from;   // the log or file that was read
  std::string error;  // empty when the drive answered
  Figures figures;
  Figures growth;  // since the previous daily run
};

/// A reading without figures: it says only which drive it is about.
Reading emptyReading(const Drive& drive);

Expected<std::string> encodeReading(const Reading& reading);
/// Leaves out figures that this version does not know.
Expected<Reading> decodeReading(ByteSpan document);

struct Readings {
  std::vector<Reading> readings;  // by name
  std::vector<Error> faults;      // of files that are not readings
};
Readings loadReadings(const DeviceRoot& root, FileSystem& files);

/// A figure of a drive under a unique name ("nvme0.spare_pct"). The growth of a counter is a figure
/// of its own ("nvme0.written_growth").
struct NamedFigure {
  std::string name;
  Unit unit;
  std::int64_t value;
  std::string_view source;
  std::string_view meaning;
};
std::vector<NamedFigure> figuresOf(const std::vector<Reading>& readings);

}  // namespace tavrel::health
