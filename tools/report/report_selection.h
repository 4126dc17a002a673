// Selects the report channels of a command, lists them and names their formats.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "base/plist.h"
#include "ioreport/ioreport.h"
#include "platform/platform.h"
#include "tools/console/command.h"

namespace tavrel {

/// Conditions from the command line, already validated; empty when not given. All must hold.
struct ReportSelection {
  std::string group;
  std::string subGroup;
  std::string categories;  // a mask; a channel must have one of its categories
  std::string format;
  std::string unit;       // a label or a number
  std::string driver;     // the name, with or without the id, or the id
  bool live = false;      // only of live services
  bool recorded = false;  // only of recorded ones; at most one of the two is set

  bool isEmpty() const { return *this == ReportSelection{}; }
  bool operator==(const ReportSelection&) const = default;
};

void addSelectionOptions(Command command, ReportSelection& selection);

/// The published channels that match the selection, grouped by driver and group. The
/// error says why there are none.
Expected<plist::Dictionary> selectChannels(Platform& platform, const ReportSelection& selection);

/// Removes the channels that `--live` and `--recorded` exclude; `live` are the live services.
void keepOrigin(const plist::Dictionary& channels, const ReportSelection& selection,
                const plist::Array& live);

/// All channels of an aggregate, in order.
std::vector<plist::Dictionary> channelsIn(const plist::Dictionary& aggregate);

/// "simple", "state", "histogram", "array", "unknown", or the number of any other format.
std::string formatName(std::uint8_t format);

/// A number of at most 64 bits, in decimal or with 0x.
std::optional<std::uint64_t> parseWord(std::string_view text);

}  // namespace tavrel
