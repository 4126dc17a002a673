// Figures derived from several figures of the NAND information.
#pragma once

#include <cstddef>
#include <cstdint>
#include <map>
#include <optional>
#include <string_view>
#include <vector>

#include "base/civil_time.h"
#include "base/plist.h"
#include "tools/console/tool_output.h"

namespace tavrel {

/// No value when a figure is missing or negative, a divisor is 0, or a size exceeds 64 bits.
struct NandDerived {
  explicit NandDerived(const plist::Dictionary& info);

  std::optional<std::uint64_t> virtualBlockBytes;
  std::optional<std::uint64_t> capacityBytes;
  std::optional<std::uint64_t> logicalReadBytes;
  std::optional<std::uint64_t> logicalWriteBytes;
  std::optional<double> freeBlocksShare;
  std::optional<double> freeNodesShare;
  std::optional<double> writeAmplification;  // bytes of erased virtual blocks / logical writes
  std::optional<CivilDate> formattedFrom;    // first day of the week of formatting
  /// Figures that are 0, not counting those of a histogram that is not empty.
  std::size_t zeros = 0;
};

struct NandBucket {
  std::string_view key;
  std::uint64_t number;  // after the stem of the key
  std::uint64_t count;
};

/// Keys that share a stem and end in three or more different numbers, by stem and in numerical
/// order. Keys lack the common prefix and are borrowed from the dictionary.
std::map<std::string_view, std::vector<NandBucket>> nandHistograms(const plist::Dictionary& info);

/// The figure of `key`, given without the common prefix; nothing when it is missing or negative.
std::optional<std::uint64_t> nandFigure(const plist::Dictionary& info, std::string_view key);

/// Unknown values become null. Shares are fractions of 1.
Json jsonOf(const NandDerived& derived);

}  // namespace tavrel
