// Parses the text in which the kernel shows figures, and makes names from the kernel's names. The
// text may contain anything.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

namespace tavrel::live {

/// An unknown value. Readers of channels treat it as absent.
inline constexpr std::int64_t kUnset = INT64_MIN;

/// Converts the kernel's number to the channel's unit.
struct Scale {
  std::int64_t multiply = 1;
  std::int64_t divide = 1;
};

/// A number in decimal or, with 0x, hexadecimal; surrounding blanks and decimal places are ignored.
/// Nothing for other text. Numbers that do not fit 64 signed bits become the largest one.
std::optional<std::int64_t> parseKernelNumber(std::string_view text);

/// `parseKernelNumber` in the channel's unit; `kUnset` when it is not a number.
std::int64_t scaledNumber(std::string_view text, Scale scale);

/// The sum of two values, neither of them `kUnset`, limited to the largest number.
std::int64_t saturatingSum(std::int64_t a, std::int64_t b);

/// Takes the next word; only blanks and ends of lines separate words. Empty at the end.
std::string_view takeWord(std::string_view& text);

/// Takes the next token of a line; blanks, ':' and `separator` separate tokens. Empty at the end.
std::string_view takeToken(std::string_view& line, char separator = ' ');

/// A name of the kernel as part of a channel's name: printable ASCII without blanks, of at most 64
/// bytes. A name that had to be changed ends in '~' and a hash, so that different names stay
/// different.
std::string channelName(std::string_view kernelName);

/// IDs whose bytes are the states' names: the first 8 bytes of each at most, as printable ASCII.
/// IDs that would be equal begin with their index, as in "2:C6".
std::vector<std::uint64_t> stateIDs(std::span<const std::string> names);

/// "1800MHz" for frequencies in whole megahertz, otherwise in kilohertz, "1800500k".
std::string frequencyName(std::int64_t kilohertz);

/// An ID for a text, the same in every process; a positive number.
std::uint64_t stableID(std::string_view text);

}  // namespace tavrel::live
