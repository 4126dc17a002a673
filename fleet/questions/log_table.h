// The fleet's logs in memory, with what questions select, group and count them by.
#pragma once

#include <array>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <optional>
#include <span>
#include <string>
#include <vector>

#include "fleet/engine/engine.h"
#include "fleet/questions/day_range.h"

namespace tavrel::fleet {

enum class Attribute : std::uint8_t { Os, Region, Digest };
inline constexpr std::size_t kAttributes = 3;

/// The position of a log in a LogTable.
using LogIndex = std::uint32_t;
inline constexpr LogIndex kNoLog = std::numeric_limits<LogIndex>::max();

class LogTable {
 public:
  /// Reads all logs. Throws EngineError.
  explicit LogTable(Engine& engine);

  std::size_t size() const { return logs_.size(); }

  /// `kNoLog` for a log that was added after the table was read.
  LogIndex find(LogId log) const;

  /// The logs are in the order of their days, so those of one day are contiguous.
  struct Day {
    std::int32_t day = 0;
    LogIndex begin = 0;
    LogIndex end = 0;
  };
  std::span<const Day> days() const { return days_; }
  std::int32_t day(LogIndex log) const { return days_[logs_[log].day].day; }
  /// The position of its day in `days()`.
  std::uint32_t dayIndex(LogIndex log) const { return logs_[log].day; }

  /// An attribute is an index into its texts; the text is "" when the log does not say.
  std::uint32_t attribute(Attribute of, LogIndex log) const {
    return logs_[log].attributes[static_cast<std::size_t>(of)];
  }
  std::span<const std::string> texts(Attribute of) const {
    return texts_[static_cast<std::size_t>(of)];
  }
  /// The number of a text; nothing when no log has it.
  std::optional<std::uint32_t> number(Attribute of, std::string_view text) const;

 private:
  struct Log {
    std::uint32_t day = 0;
    std::array<std::uint32_t, kAttributes> attributes{};
  };
  struct Slot {
    LogId log = 0;
    LogIndex index = kNoLog;
  };

  void index(std::span<const LogId> ids);
  std::size_t slotOf(LogId log) const;

  std::vector<Log> logs_;
  std::vector<Day> days_;
  std::array<std::vector<std::string>, kAttributes> texts_;
  std::vector<LogIndex> direct_;  // by LogId, when the identifiers are dense
  std::vector<Slot> slots_;       // otherwise, a hash table; its size is a power of 2
};

}  // namespace tavrel::fleet
