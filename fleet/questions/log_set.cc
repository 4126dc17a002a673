#include "fleet/questions/log_set.h"

#include <algorithm>

namespace tavrel::fleet {

namespace {

std::size_t ones(std::uint64_t word) {
  return static_cast<std::size_t>(std::popcount(word));
}

/// Counts the logs of each day, given words in ascending order.
class DayCounts {
 public:
  explicit DayCounts(const LogTable& table) : table_(table) {}

  /// `use` takes the position of a day and the number of its logs so far.
  template <class Use>
  void add(std::uint32_t position, std::uint64_t logs, const Use& use) {
    const LogIndex begin = position * 64;
    while (logs != 0) {
      const std::uint32_t day =
          table_.dayIndex(begin + static_cast<LogIndex>(std::countr_zero(logs)));
      const LogIndex left = table_.days()[day].end - begin;
      const std::uint64_t ofDay = left < 64 ? (std::uint64_t{1} << left) - 1 : ~std::uint64_t{0};
      count_ = (day == day_ ? count_ : 0) + ones(logs & ofDay);
      day_ = day;
      logs &= ~ofDay;
      use(day_, count_);
    }
  }

 private:
  const LogTable& table_;
  std::size_t day_ = 0;
  std::size_t count_ = 0;
};

}  // namespace

void LogSet::insert(LogIndex log) {
  const std::uint32_t position = log / 64;
  auto at = words_.end();
  if (!words_.empty() && words_.back().position >= position)
    at = std::ranges::lower_bound(words_, position, {}, &Word::position);
  if (at == words_.end() || at->position != position) at = words_.insert(at, {position, 0});
  at->logs |= std::uint64_t{1} << log % 64;
}

bool LogSet::contains(LogIndex log) const {
  const std::uint32_t position = log / 64;
  if (words_.empty() || position < words_.front().position) return false;
  // Without gaps, the word is here.
  const std::size_t guess = position - words_.front().position;
  auto at = words_.end();
  if (guess < words_.size() && words_[guess].position == position) {
    at = words_.begin() + static_cast<std::ptrdiff_t>(guess);
  } else {
    at = std::ranges::lower_bound(words_, position, {}, &Word::position);
  }
  return at != words_.end() && at->position == position && (at->logs >> log % 64 & 1) != 0;
}

void LogSet::add(const LogSet& other) {
  auto from = other.words_.begin();
  const auto end = other.words_.end();
  if (from == end) return;
  std::vector<Word> rest;  // of this set, from where the other begins
  const auto begin = std::ranges::lower_bound(words_, from->position, {}, &Word::position);
  rest.assign(begin, words_.end());
  words_.erase(begin, words_.end());
  for (const Word& word : rest) {
    for (; from != end && from->position < word.position; ++from)
      words_.push_back(*from);
    words_.push_back(word);
    if (from != end && from->position == word.position) words_.back().logs |= (from++)->logs;
  }
  words_.insert(words_.end(), from, end);
}

bool LogSet::includes(const LogSet& other) const {
  if (other.words_.size() > words_.size()) return false;
  auto at = words_.begin();
  return std::ranges::all_of(other.words_, [&](const Word& word) {
    at = std::ranges::lower_bound(at, words_.end(), word.position, {}, &Word::position);
    return at != words_.end() && at->position == word.position && (word.logs & ~at->logs) == 0;
  });
}

bool LogSet::isApartFrom(const LogSet& other) const {
  return empty() || other.empty() || words_.back().position < other.words_.front().position ||
         other.words_.back().position < words_.front().position;
}

std::size_t LogSet::logs() const {
  std::size_t count = 0;
  for (const Word& word : words_)
    count += ones(word.logs);
  return count;
}

std::size_t LogSet::devices(const LogTable& table) const {
  std::size_t most = 0;
  DayCounts counts(table);
  for (const Word& word : words_) {
    counts.add(word.position, word.logs,
               [&](std::size_t, std::size_t logs) { most = std::max(most, logs); });
  }
  return most;
}

void LogSet::forEachDay(const LogTable& table,
                        const std::function<void(std::size_t day, std::size_t logs)>& use) const {
  std::size_t last = 0;
  std::size_t count = 0;
  DayCounts counts(table);
  for (const Word& word : words_) {
    counts.add(word.position, word.logs, [&](std::size_t day, std::size_t logs) {
      if (count != 0 && day != last) use(last, count);
      last = day;
      count = logs;
    });
  }
  if (count != 0) use(last, count);
}

std::vector<std::size_t> LogSet::logsByDay(const LogTable& table) const {
  std::vector<std::size_t> counts(table.days().size());
  forEachDay(table, [&](std::size_t day, std::size_t logs) { counts[day] = logs; });
  return counts;
}

LogSet LogSet::without(const LogSet& other) const {
  LogSet result;
  auto at = other.words_.begin();
  for (const auto& [position, logs] : words_) {
    while (at != other.words_.end() && at->position < position)
      ++at;
    const bool isShared = at != other.words_.end() && at->position == position;
    const std::uint64_t left = isShared ? logs & ~at->logs : logs;
    if (left != 0) result.words_.push_back({position, left});
  }
  return result;
}

bool LogSet::differsByAtLeast(const LogSet& other, std::size_t devices,
                              const LogTable& table) const {
  bool isEnough = false;
  DayCounts counts(table);
  const auto add = [&](std::uint32_t position, std::uint64_t logs) {
    counts.add(position, logs,
               [&](std::size_t, std::size_t count) { isEnough = isEnough || count >= devices; });
  };
  auto a = words_.begin();
  auto b = other.words_.begin();
  while (!isEnough && (a != words_.end() || b != other.words_.end())) {
    if (b == other.words_.end() || (a != words_.end() && a->position < b->position)) {
      add(a->position, a->logs);
      ++a;
    } else if (a == words_.end() || b->position < a->position) {
      add(b->position, b->logs);
      ++b;
    } else {
      add(a->position, a->logs ^ b->logs);
      ++a;
      ++b;
    }
  }
  return isEnough;
}

std::size_t LogSet::hash() const {
  std::uint64_t result = 0;
  for (const Word& word : words_)
    result = (std::rotl(result, 5) ^ word.logs ^ word.position) * 0x9e3779b97f4a7c15U;
  return static_cast<std::size_t>(result);
}

LogSet LogMarks::set() const {
  LogSet result;
  for (std::uint32_t position = 0; position < words_.size(); ++position)
    if (words_[position] != 0) result.words_.push_back({position, words_[position]});
  return result;
}

std::shared_ptr<const LogSet> SharedLogSets::keep(const LogSet& logs) {
  const std::size_t hash = logs.hash();
  const auto [first, last] = known_.equal_range(hash);
  for (auto known = first; known != last; ++known)
    if (*known->second == logs) return known->second;
  return known_.emplace(hash, std::make_shared<const LogSet>(logs))->second;
}

LogSet logsOn(const LogTable& table, const DayRange& days) {
  LogSet logs;
  for (const LogTable::Day& day : table.days()) {
    if (!days.contains(day.day)) continue;
    for (LogIndex log = day.begin; log < day.end; ++log)
      logs.insert(log);
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
