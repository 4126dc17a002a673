#include "fleet/questions/log_set.h"

#include <algorithm>

namespace tavrel::fleet {

namespace {

std::size_t ones(std::uint64_t word) {
  return static_cast<std::size_t>(std::popcount(word));
}

/// How many of the day's logs are set; `wordAt` yields the words of a set.
template <class WordAt>
std::size_t onesOf(const LogTable::Day& day, const WordAt& wordAt) {
  std::size_t count = 0;
  for (std::size_t word = day.begin / 64; word * 64 < day.end; ++word) {
    std::uint64_t bits = wordAt(word);
    if (word == day.begin / 64) bits &= ~std::uint64_t{0} << day.begin % 64;
    if (day.end - word * 64 < 64) bits &= (std::uint64_t{1} << (day.end - word * 64)) - 1;
    count += ones(bits);
  }
  return count;
}

}  // namespace

bool LogSet::empty() const {
  return std::all_of(words_.begin(), words_.end(), [](std::uint64_t word) { return word == 0; });
}

void LogSet::add(const LogSet& other) {
  for (std::size_t i = 0; i < words_.size(); ++i)
    words_[i] |= other.words_[i];
}

bool LogSet::includes(const LogSet& other) const {
  for (std::size_t i = 0; i < words_.size(); ++i)
    if ((other.words_[i] & ~words_[i]) != 0) return false;
  return true;
}

std::size_t LogSet::logs() const {
  std::size_t count = 0;
  for (const std::uint64_t word : words_)
    count += ones(word);
  return count;
}

std::size_t LogSet::devices(const LogTable& table) const {
  std::size_t most = 0;
  for (const LogTable::Day& day : table.days())
    most = std::max(most, onesOf(day, [&](std::size_t word) { return words_[word]; }));
  return most;
}

std::vector<std::size_t> LogSet::logsByDay(const LogTable& table) const {
  std::vector<std::size_t> counts;
  counts.reserve(table.days().size());
  for (const LogTable::Day& day : table.days())
    counts.push_back(onesOf(day, [&](std::size_t word) { return words_[word]; }));
  return counts;
}

LogSet LogSet::without(const LogSet& other) const {
  LogSet result = *this;
  for (std::size_t i = 0; i < words_.size(); ++i)
    result.words_[i] &= ~other.words_[i];
  return result;
}

bool LogSet::differsByAtLeast(const LogSet& other, std::size_t devices,
                              const LogTable& table) const {
  const auto isInOne = [&](std::size_t word) { return words_[word] ^ other.words_[word]; };
  return std::any_of(table.days().begin(), table.days().end(),
                     [&](const LogTable::Day& day) { return onesOf(day, isInOne) >= devices; });
}

std::size_t LogSet::hash() const {
  std::uint64_t result = 0;
  for (const std::uint64_t word : words_)
    result = (std::rotl(result, 5) ^ word) * 0x9e3779b97f4a7c15U;
  return static_cast<std::size_t>(result);
}

LogSet logsOn(const LogTable& table, const DayRange& days) {
  LogSet logs(table);
  for (LogIndex log = 0; log < table.size(); ++log) {
    if (days.contains(table.day(log))) logs.insert(log);
  }
  return logs;
}

void DeviceCounter::insert(LogIndex log) {
  if (seen_[log]) return;
  seen_[log] = true;
  logs_.push_back(log);
  devices_ = std::max<std::size_t>(devices_, ++ofDay_[table_.dayIndex(log)]);
}

void DeviceCounter::clear() {
  for (const LogIndex log : logs_) {
    seen_[log] = false;
    ofDay_[table_.dayIndex(log)] = 0;
  }
  logs_.clear();
  devices_ = 0;
}

}  // namespace tavrel::fleet
