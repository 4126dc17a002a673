// Health figures of drives: what each is called, where it comes from and what it means.
//
// Each kind of drive has tables of `FigureKind`, from which its reader, the documents of the tool
// and the stored readings are made. A drive that does not tell a figure lacks it; there is no value
// for "unknown".
#pragma once

#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace tavrel::health {

/// Unit codes as report channels have them: the quantity in the top byte, the scale below.
using Unit = std::uint64_t;
inline constexpr Unit kPlain = 0;  // percentages, states, hours: the name says which
inline constexpr Unit kBytes = 0x0900820000000000;
inline constexpr Unit kMillidegrees = 0x0A00007C00000000;
inline constexpr Unit kEvents = 0x6400000000000000;

enum class DriveKind : std::uint8_t { Nvme, Emmc, Ufs, Ata, Mtd, Ubi };
std::string_view nameOf(DriveKind kind);

/// How a figure goes on.
enum class Course : std::uint8_t {
  Gauge,     // up and down
  Lifetime,  // a counter that the drive keeps
  Attached,  // a counter that starts from zero when the kernel attaches the drive
};

/// Where a figure stands in a log page, little-endian.
struct Place {
  std::uint16_t offset = 0;
  std::uint16_t width = 0;       // bytes, at most 16
  std::uint32_t multiplier = 1;  // to the unit
  bool zeroIsUnknown = false;
  std::uint8_t largest = 255;  // of one-byte fields: what is more makes no sense and is dropped
};

struct FigureKind {
  std::string_view name;
  Unit unit;
  Course course;
  std::string_view source;
  std::string_view meaning;
  Place place = {};
};

struct Figure {
  const FigureKind* kind;
  std::int64_t value;
};
using Figures = std::vector<Figure>;

/// Nothing when the drive does not tell it.
const std::int64_t* valueOf(const Figures& figures, std::string_view name);

/// The kind of that name, null when there is none.
const FigureKind* figureKind(DriveKind drive, std::string_view name);

}  // namespace tavrel::health
