// The text forms in which the kernel shows figures, and the names made of its names. The text may
// hold anything.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace tavrel::live {

/// A value that is not known. Readers of channels take it as absent.
inline constexpr std::int64_t kUnset = INT64_MIN;

/// From the kernel's number to the channel's unit.
struct Scale {
  std::int64_t multiply = 1;
  std::int64_t divide = 1;
};

/// A number in decimal or, with 0x, hexadecimal; blanks around it and decimals after it do not
/// count. Nothing for other text. Numbers beyond 64 bits with a sign are the largest one.
std::optional<std::int64_t> parseNumber(std::string_view text);

/// `parseNumber` in the channel's unit; `kUnset` when it is no number.
std::int64_t scaledNumber(std::string_view text, Scale scale);

/// The sum of two values, neither of them `kUnset`; it stops at the largest number.
std::int64_t saturatingSum(std::int64_t a, std::int64_t b);

/// Takes the next line, without its end.
std::string_view takeLine(std::string_view& text);

/// Takes the next token of a line; blanks, ':' and '=' part tokens. Empty at the end.
std::string_view takeToken(std::string_view& line);

/// A name of the kernel as part of a channel's name: printable ASCII without blanks, of at most 64
/// bytes. A name that had to be changed ends in '~' and a hash, so that no two become one.
std::string channelName(std::string_view kernelName);

/// Ids whose text are the states' names: at most 8 printable ASCII bytes, the first of each name.
/// When two would be equal, all of those begin with their index, as in "2:C6".
std::vector<std::uint64_t> stateIDs(std::span<const std::string> names);

/// "1800MHz" for frequencies in whole megahertz, otherwise in whole kilohertz "1800500k".
std::string frequencyName(std::int64_t kilohertz);

/// The same text always has the same id, a positive number other than 0.
std::uint64_t stableID(std::string_view text);

}  // namespace tavrel::live
