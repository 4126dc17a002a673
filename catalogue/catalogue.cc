#include "catalogue/catalogue.h"

#include <algorithm>
#include <array>
#include <cstddef>
#include <utility>

namespace tavrel::catalogue {
namespace {

#include "catalogue_rows.inc"

std::string_view prefixOf(const Entry& entry) {
  return entry.key.substr(0, entry.key.find_first_of("<*"));
}

bool isDigit(char c) {
  return c >= '0' && c <= '9';
}

bool fits(std::string_view text, std::string_view pattern) {
  const std::string_view tail = pattern.substr(pattern.rfind('>') + 1);
  if (!tail.ends_with('*') && !text.ends_with(tail)) return false;
  const std::size_t literal = std::min(pattern.find_first_of("<*"), pattern.size());
  if (!text.starts_with(pattern.substr(0, literal))) return false;
  text.remove_prefix(literal);
  pattern.remove_prefix(literal);
  if (pattern.empty()) return text.empty();
  if (pattern == "*") return true;
  const std::string_view rest = pattern.substr(pattern.find('>') + 1);
  const bool isNumber = pattern.starts_with("<n>");
  for (std::size_t taken = isNumber ? 0 : 1; taken <= text.size(); ++taken) {
    if (isNumber && taken > 0 && !isDigit(text[taken - 1])) return false;
    if (fits(text.substr(taken), rest)) return true;
  }
  return false;
}

std::size_t literalLength(std::string_view pattern) {
  std::size_t length = 0;
  bool isInside = false;
  for (const char c : pattern) {
    isInside = (isInside || c == '<') && c != '>';
    length += !isInside && c != '>' && c != '*';
  }
  return length;
}

// `rows` are sorted by their prefixes.
const Entry* findRow(std::span<const Entry> rows, std::string_view name) {
  // Prefixes of `probe` sort before everything greater than it. So the last row that is not greater
  // is one of them, or has in common with `probe` all that a shorter one could be.
  std::string_view probe = name;
  while (true) {
    const auto end = std::ranges::upper_bound(rows, probe, {}, prefixOf);
    if (end == rows.begin()) return nullptr;
    const std::string_view prefix = prefixOf(end[-1]);
    if (!name.starts_with(prefix)) {
      const auto differs = std::ranges::mismatch(probe, prefix).in1;
      probe = probe.substr(0, static_cast<std::size_t>(differs - probe.begin()));
      continue;
    }
    const Entry* best = nullptr;
    for (auto row = end; row != rows.begin() && prefixOf(row[-1]) == prefix; --row) {
      const Entry& entry = row[-1];
      if (best && literalLength(best->key) >= literalLength(entry.key)) continue;
      if (fits(name, entry.key)) best = &entry;
    }
    if (best || prefix.empty()) return best;
    probe = prefix.substr(0, prefix.size() - 1);
  }
}

// The second channel of the same name ends in "#2".
const Entry* find(std::span<const Entry> rows, std::string_view name) {
  const std::size_t mark = name.find_last_not_of("0123456789");
  const bool isNumbered = mark < name.size() - 1 && name[mark] == '#';
  return findRow(rows, isNumbered ? name.substr(0, mark) : name);
}

}  // namespace

const Entry* findStatistic(std::string_view key) {
  return find(kStatistics, key);
}

std::string_view unitOf(std::string_view key) {
  const Entry* const entry = findStatistic(key);
  return entry != nullptr ? entry->unit : std::string_view();
}

const Entry* findChannel(std::string_view driver, std::string_view group,
                         std::string_view channel) {
  driver = driver.substr(0, driver.find(" <id "));
  const auto place = [](const Entry& row) { return std::pair(row.driver, row.group); };
  const std::pair wanted(driver, group);
  const auto first = std::ranges::lower_bound(kChannels, wanted, {}, place);
  const auto last = std::ranges::upper_bound(kChannels, wanted, {}, place);
  return find({first, last}, channel);
}

const Entry* findController(std::string_view name) {
  return find(kControllers, name);
}

std::span<const Entry> entries(Kind kind) {
  switch (kind) {
    case Kind::Channel:
      return kChannels;
    case Kind::Controller:
      return kControllers;
    default:
      return kStatistics;
  }
}

std::string_view nameOf(Since since) {
  constexpr std::array<std::string_view, 8> kNames = {"",     "now",    "day",   "run",
                                                      "boot", "attach", "reset", "life"};
  return kNames[static_cast<std::size_t>(since)];
}

}  // namespace tavrel::catalogue
