// Sets of logs of one LogTable, and how many devices they are known to come from.
//
// A log covers one day of one device but does not say which device, so devices cannot be counted.
// But each device has one log per day: a set has at least as many devices as logs of any one day.
#pragma once

#include <bit>
#include <cstddef>
#include <cstdint>
#include <functional>
#include <map>
#include <memory>
#include <vector>

#include "fleet/questions/log_table.h"

namespace tavrel::fleet {

/// Takes memory in proportion to its logs, not to those of the table.
class LogSet {
 public:
  /// Fast when the logs come in ascending order; see LogMarks for others.
  void insert(LogIndex log);
  bool contains(LogIndex log) const;
  template <class Use>
  void forEach(const Use& use) const {
    for (const auto& [position, logs] : words_) {
      for (std::uint64_t word = logs; word != 0; word &= word - 1)
        use(position * 64 + static_cast<LogIndex>(std::countr_zero(word)));
    }
  }
  bool empty() const { return words_.empty(); }
  void add(const LogSet& other);
  bool includes(const LogSet& other) const;
  /// Whether the sets share no log, as far as their first and last logs tell.
  bool isApartFrom(const LogSet& other) const;

  bool operator==(const LogSet&) const = default;

  std::size_t logs() const;
  /// The largest number of logs on one day.
  std::size_t devices(const LogTable& table) const;
  /// The number of logs of each day of the table.
  std::vector<std::size_t> logsByDay(const LogTable& table) const;
  /// Hands out the position of each day that has logs, and their number, in ascending order.
  void forEachDay(const LogTable& table,
                  const std::function<void(std::size_t day, std::size_t logs)>& use) const;

  LogSet without(const LogSet& other) const;
  /// Whether the logs that only one of the two sets has come from at least `devices` devices.
  bool differsByAtLeast(const LogSet& other, std::size_t devices, const LogTable& table) const;
  std::size_t hash() const;

 private:
  friend class LogMarks;

  /// Of each 64 logs of the table, those that are in the set: never none.
  struct Word {
    std::uint32_t position = 0;
    std::uint64_t logs = 0;
    bool operator==(const Word&) const = default;
  };

  std::vector<Word> words_;  // by position
};

/// A set that takes logs in any order, in memory for all logs of the table.
class LogMarks {
 public:
  explicit LogMarks(const LogTable& table) : words_((table.size() + 63) / 64) {}

  void insert(LogIndex log) { words_[log / 64] |= std::uint64_t{1} << log % 64; }
  LogSet set() const;

 private:
  std::vector<std::uint64_t> words_;
};

/// Keeps equal sets once: many statistics have the same logs.
class SharedLogSets {
 public:
  std::shared_ptr<const LogSet> keep(const LogSet& logs);

 private:
  std::multimap<std::size_t, std::shared_ptr<const LogSet>> known_;  // by hash
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
