// The labels of units. A row gives the scale (bits 32-55) and the factor word (bits 0-31) of the
// units that it labels; both must match exactly.
#pragma once

#include <cstdint>
#include <string_view>

namespace tavrel {

struct ScaleLabel {
  std::uint32_t scale;
  std::uint32_t factorWord;
  std::string_view text;
};

/// Complete labels, whatever the quantity.
inline constexpr ScaleLabel kCompleteLabels[] = {
    {0x000076, 1, "1Gticks"},
    {0x000079, 0x80000018, "24Mticks"},
    {0x010000, 0, "hwticks?"},
    {0x020000, 0, "hwpage?"},
};

/// Prefixes of the quantity's suffix.
inline constexpr ScaleLabel kUnitPrefixes[] = {
    {0x000073, 0, "p"},   {0x000076, 0, "n"},    {0x000079, 0, "u"},    {0x00007C, 0, "m"},
    {0x000082, 0, "k"},   {0x000085, 0, "M"},    {0x000088, 0, "G"},    {0x00008B, 0, "T"},
    {0x008900, 0, "Ki"},  {0x009300, 0, "Mi"},   {0x009D00, 0, "Gi"},   {0x00A700, 0, "Ti"},
    {0x008C00, 0, "KiB"}, {0x008C00, 4, "4KiB"}, {0x008C00, 8, "8KiB"}, {0x009600, 0, "MiB"},
    {0x00A000, 0, "GiB"}, {0x00AA00, 0, "TiB"},
};

struct QuantitySuffix {
  std::uint8_t quantity;
  std::string_view text;
};

inline constexpr std::uint8_t kQuantityData = 9;
inline constexpr std::string_view kUnknownQuantity = "??";

/// Suffixes of all quantities except data, whose suffix depends on the scale.
inline constexpr QuantitySuffix kQuantitySuffixes[] = {
    {0, ""},    // dimensionless
    {1, "s"},   // time
    {2, "W"},   // power
    {3, "J"},   // energy
    {4, "A"},   // current
    {5, "V"},   // voltage
    {6, "F"},   // capacitance
    {7, "H"},   // inductance
    {8, "Hz"},  // frequency
    {10, "C"},  // temperature
    {100, "events"}, {101, "packets"},
};

/// Suffixes of data: bits and bytes without a prefix.
inline constexpr ScaleLabel kDataSuffixes[] = {
    {0x000000, 0, "b"},
    {0x008200, 0, "B"},
};

}  // namespace tavrel
