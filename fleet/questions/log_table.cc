#include "fleet/questions/log_table.h"

#include <algorithm>
#include <bit>
#include <string_view>
#include <unordered_map>

#include "base/keyed_hash.h"

namespace tavrel::fleet {

namespace {

/// Numbers texts in the order of their first occurrence.
class Interner {
 public:
  explicit Interner(std::vector<std::string>& texts) : texts_(texts) {}

  std::uint32_t number(std::string_view text) {
    if (const auto found = numbers_.find(text); found != numbers_.end()) return found->second;
    const auto next = static_cast<std::uint32_t>(texts_.size());
    texts_.emplace_back(text);
    numbers_.emplace(text, next);
    return next;
  }

 private:
  std::vector<std::string>& texts_;
  std::unordered_map<std::string, std::uint32_t, KeyedHash, std::equal_to<>> numbers_;
};

}  // namespace

LogTable::LogTable(Engine& engine) {
  struct Read {
    LogId log;
    std::int32_t day;
    std::array<std::uint32_t, kAttributes> attributes;
  };
  std::vector<Read> read;
  Interner os(texts_[0]);
  Interner region(texts_[1]);
  Interner digest(texts_[2]);
  const DayRange all;
  engine.logs(all.first, all.last, [&](std::span<const LogRow> rows) {
    for (const LogRow& row : rows) {
      read.push_back({row.log,
                      row.day,
                      {os.number(row.osVersion), region.number(row.region),
                       digest.number(row.whitelistDigest)}});
    }
  });
  if (read.size() >= kNoLog) throw EngineError("more logs than one question can take: load fewer");

  std::sort(read.begin(), read.end(), [](const Read& a, const Read& b) {
    return a.day != b.day ? a.day < b.day : a.log < b.log;
  });
  std::vector<LogId> ids;
  ids.reserve(read.size());
  logs_.reserve(read.size());
  for (const Read& log : read) {
    const auto position = static_cast<LogIndex>(logs_.size());
    if (days_.empty() || days_.back().day != log.day)
      days_.push_back({log.day, position, position});
    days_.back().end = position + 1;
    logs_.push_back({static_cast<std::uint32_t>(days_.size() - 1), log.attributes});
    ids.push_back(log.log);
  }
  index(ids);
}

void LogTable::index(std::span<const LogId> ids) {
  constexpr std::size_t kSparse = 8;
  if (ids.empty()) return;
  const LogId largest = *std::max_element(ids.begin(), ids.end());
  if (largest / kSparse < ids.size()) {
    direct_.assign(static_cast<std::size_t>(largest) + 1, kNoLog);
    for (LogIndex i = 0; i < ids.size(); ++i)
      direct_[static_cast<std::size_t>(ids[i])] = i;
    return;
  }
  slots_.resize(std::bit_ceil(ids.size() * 2));
  for (LogIndex i = 0; i < ids.size(); ++i)
    slots_[slotOf(ids[i])] = {ids[i], i};
}

/// The slot that holds the log, or the empty one where it would be.
std::size_t LogTable::slotOf(LogId log) const {
  const std::size_t mask = slots_.size() - 1;
  std::size_t slot = (log * 0x9e3779b97f4a7c15U) >> (64 - std::bit_width(mask));
  while (slots_[slot].index != kNoLog && slots_[slot].log != log)
    slot = (slot + 1) & mask;
  return slot;
}

LogIndex LogTable::find(LogId log) const {
  if (log < direct_.size()) return direct_[static_cast<std::size_t>(log)];
  return slots_.empty() ? kNoLog : slots_[slotOf(log)].index;
}

std::optional<std::uint32_t> LogTable::number(Attribute of, std::string_view text) const {
  const auto all = texts(of);
  const auto found = std::find(all.begin(), all.end(), text);
  if (found == all.end()) return std::nullopt;
  return static_cast<std::uint32_t>(found - all.begin());
}

}  // namespace tavrel::fleet
