// The file is text, in lines of words:
//
//   tavrel-collect 1
//   boot IDENTITY
//   at NANOSECONDS
//   cpu BUSY TOTAL
//   network IN OUT
//   disk IN OUT
//   remainder KEY NUMBER
//
// A counter that the machine does not provide has no line. The last line is "end".
#include "tools/stat/collect_state.h"

#include <algorithm>
#include <charconv>
#include <vector>

#include "base/format.h"
#include "base/parse_number.h"
#include "platform/linux/files/file_system.h"

namespace tavrel {
namespace {

constexpr std::string_view kFirstLine = "tavrel-collect 1";

// Bytes. A file of this version has some 600.
constexpr std::size_t kLargestState = 8192;

constexpr std::chrono::hours kOldestState{24};

std::vector<std::string_view> takeWords(std::string_view& text) {
  const std::string_view line = text.substr(0, text.find('\n'));
  text.remove_prefix(std::min(text.size(), line.size() + 1));
  std::vector<std::string_view> words;
  for (std::size_t start = 0; start <= line.size();) {
    const std::size_t end = std::min(line.find(' ', start), line.size());
    words.push_back(line.substr(start, end - start));
    start = end + 1;
  }
  return words;
}

template <class Pair>
bool parsePair(const std::vector<std::string_view>& words, std::optional<Pair>& pair) {
  if (words.size() != 3) return false;
  const auto first = parseNumber<std::uint64_t>(words[1]);
  const auto second = parseNumber<std::uint64_t>(words[2]);
  if (!first || !second) return false;
  pair = Pair{*first, *second};
  return true;
}

struct Parsed {
  CollectState state;
  std::string_view boot;
};

bool parseLine(const std::vector<std::string_view>& words, Parsed& parsed) {
  CollectState& state = parsed.state;
  if (words[0] == "cpu") return parsePair(words, state.machine.cpu);
  if (words[0] == "network") return parsePair(words, state.machine.network);
  if (words[0] == "disk") return parsePair(words, state.machine.disk);
  if (words[0] == "boot" && words.size() == 2) {
    parsed.boot = words[1];
    return true;
  }
  if (words[0] == "at" && words.size() == 2) {
    const auto nanoseconds = parseNumber<std::int64_t>(words[1]);
    if (!nanoseconds || *nanoseconds < 0) return false;
    state.at = std::chrono::nanoseconds(*nanoseconds);
    return true;
  }
  if (words[0] == "remainder" && words.size() == 3) {
    const auto number = parseNumber<double>(words[2]);
    if (!number || !(*number >= 0 && *number < 1)) return false;
    state.remainders[std::string(words[1])] = *number;
    return true;
  }
  return false;
}

std::optional<Parsed> parseState(std::string_view text) {
  Parsed parsed;
  if (!text.starts_with(kFirstLine)) return std::nullopt;
  takeWords(text);
  while (!text.empty()) {
    const auto words = takeWords(text);
    if (words[0] == "end") return parsed;
    if (!parseLine(words, parsed)) return std::nullopt;
  }
  return std::nullopt;
}

template <class Pair>
void appendPair(std::string& text, const char* name, const std::optional<Pair>& pair) {
  if (!pair) return;
  const auto [first, second] = *pair;
  text.append(name).append(" ").append(std::to_string(first));
  text.append(" ").append(std::to_string(second)).append("\n");
}

}  // namespace

Expected<std::optional<CollectState>> readCollectState(const std::string& path,
                                                       const std::string& boot,
                                                       std::chrono::nanoseconds now) {
  FileSystem files;
  const auto text = files.readIfPresent(path, kLargestState);
  if (!text) return text.error();
  if (!*text) return std::optional<CollectState>();
  auto parsed = parseState(**text);
  if (!parsed)
    return Error{format("%s is not a reading of 'tavrelctl stat collect': it is replaced", path)};
  const bool isUsable = !boot.empty() && parsed->boot == boot && parsed->state.at <= now &&
                        now - parsed->state.at <= kOldestState;
  if (!isUsable) return std::optional<CollectState>();
  return std::optional(std::move(parsed->state));
}

Status writeCollectState(const std::string& path, const std::string& boot,
                         const CollectState& state) {
  std::string text(kFirstLine);
  text.append("\nboot ").append(boot.empty() ? "-" : boot);
  text.append("\nat ").append(std::to_string(state.at.count())).append("\n");
  appendPair(text, "cpu", state.machine.cpu);
  appendPair(text, "network", state.machine.network);
  appendPair(text, "disk", state.machine.disk);
  for (const auto& [key, number] : state.remainders) {
    char digits[32];
    const auto [end, error] = std::to_chars(digits, digits + sizeof digits, number);
    text.append("remainder ").append(key).append(" ").append(digits, end).append("\n");
  }
  text += "end\n";
  FileSystem files;
  return files.replace(path, asBytes(text), 0644);
}

}  // namespace tavrel
