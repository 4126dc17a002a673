// Parses texts that consist of one number only.
#pragma once

#include <charconv>
#include <concepts>
#include <optional>
#include <string_view>
#include <system_error>

namespace tavrel {

/// The text as an integer, in digits of `base` without a prefix; only signed types accept a minus
/// sign. Nothing when the text contains anything else or the number does not fit.
template <std::integral Number>
std::optional<Number> parseNumber(std::string_view text, int base = 10) {
  Number number{};
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, number, base);
  if (error != std::errc() || stop != end) return std::nullopt;
  return number;
}

/// The same for reals: "1.5", "-2e3", "inf", "nan".
template <std::floating_point Number>
std::optional<Number> parseNumber(std::string_view text) {
  Number number{};
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, number);
  if (error != std::errc() || stop != end) return std::nullopt;
  return number;
}

}  // namespace tavrel
