#include "tools/shared/typed_value.h"

#include <algorithm>
#include <charconv>
#include <optional>

#include "base/format.h"
#include "base/iso_date.h"
#include "platform/plist/encodable_text.h"

namespace tavrel {
namespace {

template <class Number>
std::optional<Number> wholeNumber(std::string_view text) {
  Number value{};
  const char* const end = text.data() + text.size();
  const auto [stop, error] = std::from_chars(text.data(), end, value);
  if (text.empty() || error != std::errc() || stop != end) return std::nullopt;
  return value;
}

Error notA(std::string_view what, std::string_view text, std::string_view expected) {
  return Error{format("not %s: %s: give %s", what, text, expected)};
}

Expected<plist::Value> parseBoolean(std::string_view text) {
  for (const std::string_view yes : {"true", "yes", "on", "1"}) {
    if (text == yes) return plist::Value(true);
  }
  for (const std::string_view no : {"false", "no", "off", "0"}) {
    if (text == no) return plist::Value(false);
  }
  return notA("a boolean", text, "true or false");
}

}  // namespace

Expected<plist::Value> parseArgument(std::string_view text, ArgumentKind kind) {
  switch (kind) {
    case ArgumentKind::Text:
      break;
    case ArgumentKind::Boolean:
      return parseBoolean(text);
    case ArgumentKind::Integer:
      if (const auto number = wholeNumber<std::int64_t>(text)) return plist::Value(*number);
      if (const auto number = wholeNumber<std::uint64_t>(text)) return plist::Value(*number);
      return notA("an integer", text, "a decimal number of at most 64 bits");
    case ArgumentKind::Real:
      if (const auto number = wholeNumber<double>(text)) return plist::Value(*number);
      return notA("a real number", text, "a number such as 2.5, 1e-3, inf or nan");
    case ArgumentKind::Date: {
      const auto date = parseIsoDate(text);
      if (!date) return date.error();
      return plist::Value(*date);
    }
  }
  return plist::Value(text);
}

bool hasXmlTextsOnly(const plist::Value& value) {
  if (const auto text = value.string()) return plist::isEncodable(*text, plist::Alphabet::Xml);
  const plist::Array array = value.array();
  if (!std::all_of(array.begin(), array.end(), hasXmlTextsOnly)) return false;
  for (const plist::Entry& entry : value.dictionary()) {
    if (!plist::isEncodable(entry.key, plist::Alphabet::Xml) || !hasXmlTextsOnly(entry.value))
      return false;
  }
  return true;
}

}  // namespace tavrel
