// Sets of logs of one LogTable, and how many devices they are known to come from.
//
// A log covers one day of one device but does not say which device, so devices cannot be counted.
// But each device has one log per day: a set has at least as many devices as logs of any one day.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <vector>

#include "fleet/questions/log_table.h"

namespace tavrel::fleet {

class LogSet {
 public:
  /// An empty set.
  explicit LogSet(const LogTable& table) : words_((table.size() + 63) / 64) {}

  void insert(LogIndex log) { words_[log / 64] |= std::uint64_t{1} << log % 64; }
  bool contains(LogIndex log) const { return (words_[log / 64] >> log % 64 & 1) != 0; }
  template <class Use>
  void forEach(const Use& use) const {
    for (std::size_t i = 0; i < words_.size(); ++i) {
      for (std::uint64_t word = words_[i]; word != 0; word &= word - 1) {
        use(static_cast<LogIndex>(i * 64 + static_cast<std::size_t>(std::countr_zero(word))));
      }
    }
  }
  bool empty() const;
  void add(const LogSet& other);
  bool includes(const LogSet& other) const;

  bool operator==(const LogSet&) const = default;

  std::size_t logs() const;
  /// The largest number of logs on one day.
  std::size_t devices(const LogTable& table) const;
  /// The number of logs of each day of the table.
  std::vector<std::size_t> logsByDay(const LogTable& table) const;

  LogSet without(const LogSet& other) const;
  /// Whether the logs that only one of the two sets has come from at least `devices` devices.
  bool differsByAtLeast(const LogSet& other, std::size_t devices, const LogTable& table) const;
  std::size_t hash() const;

 private:
  std::vector<std::uint64_t> words_;
};

/// The logs of these days.
LogSet logsOn(const LogTable& table, const DayRange& days);

/// Counts the devices of a set that grows log by log.
class DeviceCounter {
 public:
  explicit DeviceCounter(const LogTable& table)
      : table_(table), seen_(table.size()), ofDay_(table.days().size()) {}

  /// A log that was already inserted changes nothing.
  void insert(LogIndex log);
  std::size_t devices() const { return devices_; }
  /// Empties the set; takes time proportional to the number of its logs.
  void clear();

 private:
  const LogTable& table_;
  std::vector<bool> seen_;
  std::vector<std::uint32_t> ofDay_;
  std::vector<LogIndex> logs_;
  std::size_t devices_ = 0;
};

}  // namespace tavrel::fleet
