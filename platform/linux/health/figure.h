// Health figures of drives: their names, sources and meanings.
//
// Tables of `FigureKind` for each kind of drive define what its reader, the tool's documents and
// the stored readings contain. A figure that a drive does not report is absent; there is no value
// for "unknown".
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "platform/report_units.h"

namespace tavrel::health {

using units::kBytes;
using units::kEvents;
using units::kMillidegrees;
using units::kPlain;  // percentages, states, hours: the name says which
using units::Unit;

enum class DriveKind : std::uint8_t { Nvme, Emmc, Ufs, Ata, Mtd, Ubi };
std::string_view nameOf(DriveKind kind);

/// When a counter starts again from zero.
enum class Resets : std::uint8_t {
  NotACounter,  // goes up and down
  Never,        // the drive keeps it
  OnAttach,     // when the kernel attaches the drive
};

/// Where a figure is in a log page, little-endian.
struct Place {
  std::uint16_t offset = 0;
  std::uint16_t width = 0;       // bytes, at most 16
  std::uint32_t multiplier = 1;  // to the unit
  bool zeroIsUnknown = false;
  std::uint8_t largest = 255;  // for one-byte fields: higher values are nonsense, and dropped
};

// NOLINTNEXTLINE(clang-analyzer-optin.performance.Padding): in the order of the tables' columns.
struct FigureKind {
  std::string_view name;
  Unit unit;
  Resets resets;
  std::string_view source;
  std::string_view meaning;
  Place place = {};
};

struct Figure {
  const FigureKind* kind;
  std::int64_t value;
};
using Figures = std::vector<Figure>;

/// Null when the drive does not report it.
const std::int64_t* valueOf(const Figures& figures, std::string_view name);

/// The kind of that name, null when there is none.
const FigureKind* figureKind(DriveKind drive, std::string_view name);

}  // namespace tavrel::health
