#include "platform/linux/live/kernel_text.h"

#include <algorithm>
#include <charconv>
#include <unordered_map>

#include "base/arithmetic.h"
#include "base/ascii.h"
#include "base/format.h"

namespace tavrel::live {
namespace {

constexpr std::size_t kLongestName = 64;
constexpr std::size_t kStateNameBytes = 8;

constexpr bool isBlank(char c) {
  return c == ' ' || c == '\t' || c == '\n' || c == '\r';
}
constexpr bool isPrintable(char c) {
  return c > ' ' && c <= '~';
}

// FNV-1a, without a random key: IDs must be the same in all processes.
std::uint64_t hashOf(std::string_view text) {
  std::uint64_t hash = 0xcbf29ce484222325;
  for (const char c : text) {
    hash ^= static_cast<unsigned char>(c);
    hash *= 0x100000001b3;
  }
  return hash;
}

std::uint64_t wordOf(std::string_view name) {
  std::uint64_t word = 0;
  for (const char c : name)
    word = word << 8 | static_cast<unsigned char>(c);
  return word;
}

}  // namespace

std::optional<std::int64_t> parseKernelNumber(std::string_view text) {
  while (!text.empty() && isBlank(text.front()))
    text.remove_prefix(1);
  while (!text.empty() && isBlank(text.back()))
    text.remove_suffix(1);
  const bool isNegative = text.starts_with('-');
  if (isNegative) text.remove_prefix(1);
  const bool isHexadecimal = text.starts_with("0x");
  if (isHexadecimal) text.remove_prefix(2);
  std::uint64_t magnitude = 0;
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, magnitude, isHexadecimal ? 16 : 10);
  if (error == std::errc::invalid_argument) return std::nullopt;
  if (stop != end) {
    if (isHexadecimal || *stop != '.' || !std::all_of(stop + 1, end, isDigit)) return std::nullopt;
  }
  constexpr std::uint64_t kLargest = INT64_MAX;
  if (error == std::errc::result_out_of_range) magnitude = kLargest;
  const auto value = static_cast<std::int64_t>(std::min(magnitude, kLargest));
  return isNegative ? -value : value;
}

std::int64_t scaledNumber(std::string_view text, Scale scale) {
  const auto number = parseKernelNumber(text);
  if (!number) return kUnset;
  std::int64_t product = 0;
  if (__builtin_mul_overflow(*number, scale.multiply, &product)) {
    product = *number < 0 ? -INT64_MAX : INT64_MAX;
  }
  return product / scale.divide;
}

std::int64_t saturatingSum(std::int64_t a, std::int64_t b) {
  return std::max(saturatingAdd(a, b), -INT64_MAX);
}

std::string_view takeWord(std::string_view& text) {
  const auto* const begin = std::find_if_not(text.begin(), text.end(), isBlank);
  const auto* const end = std::find_if(begin, text.end(), isBlank);
  text.remove_prefix(static_cast<std::size_t>(end - text.begin()));
  return {begin, end};
}

std::string_view takeToken(std::string_view& line, char separator) {
  const auto isBetween = [=](char c) { return isBlank(c) || c == ':' || c == separator; };
  const auto* const begin = std::find_if_not(line.begin(), line.end(), isBetween);
  const auto* const end = std::find_if(begin, line.end(), isBetween);
  line.remove_prefix(static_cast<std::size_t>(end - line.begin()));
  return {begin, end};
}

std::string channelName(std::string_view kernelName) {
  std::string name(kernelName.substr(0, kLongestName));
  std::replace_if(
      name.begin(), name.end(), [](char c) { return !isPrintable(c); }, '_');
  if (name == kernelName && !name.empty()) return name;
  const std::string hash =
      format("~%08llx", static_cast<std::uint64_t>(hashOf(kernelName) & 0xffffffff));
  return name.substr(0, kLongestName - hash.size()) + hash;
}

std::vector<std::uint64_t> stateIDs(std::span<const std::string> names) {
  std::vector<std::string> texts;
  std::unordered_map<std::string, std::size_t> counts;
  for (const std::string& name : names) {
    std::string text;
    std::copy_if(name.begin(), name.end(), std::back_inserter(text), isPrintable);
    texts.push_back(text.substr(0, kStateNameBytes));
    ++counts[texts.back()];
  }
  const auto withIndex = [&](std::size_t i) {
    return (std::to_string(i) + ':' + texts[i]).substr(0, kStateNameBytes);
  };
  std::vector<std::string> distinct = texts;
  std::unordered_map<std::string, std::size_t> distinctCounts;
  bool isClear = true;
  for (std::size_t i = 0; i < texts.size(); ++i) {
    if (texts[i].empty() || counts[texts[i]] > 1) distinct[i] = withIndex(i);
    isClear = ++distinctCounts[distinct[i]] == 1 && isClear;
  }
  std::vector<std::uint64_t> ids;
  for (std::size_t i = 0; i < texts.size(); ++i)
    ids.push_back(wordOf(isClear ? distinct[i] : withIndex(i)));
  return ids;
}

std::string frequencyName(std::int64_t kilohertz) {
  if (kilohertz % 1000 == 0) return std::to_string(kilohertz / 1000) + "MHz";
  return std::to_string(kilohertz) + 'k';
}

std::uint64_t stableID(std::string_view text) {
  const std::uint64_t id = hashOf(text) & INT64_MAX;
  return id == 0 ? 1 : id;
}

}  // namespace tavrel::live
