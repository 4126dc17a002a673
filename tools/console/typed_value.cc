#include "tools/console/typed_value.h"

#include <algorithm>

#include "base/format.h"
#include "base/iso_date.h"
#include "base/parse_number.h"
#include "platform/plist/encodable_text.h"

namespace tavrel {
namespace {

Error notA(std::string_view what, std::string_view text, std::string_view expected) {
  return Error{format("not %s: %s: give %s", what, text, expected)};
}

Expected<plist::Value> parseBoolean(std::string_view text) {
  std::string lower(text);
  std::ranges::transform(lower, lower.begin(), [](char c) {
    return c >= 'A' && c <= 'Z' ? static_cast<char>(c - 'A' + 'a') : c;
  });
  for (const std::string_view yes : {"true", "yes", "on", "1"}) {
    if (lower == yes) return plist::Value(true);
  }
  for (const std::string_view no : {"false", "no", "off", "0"}) {
    if (lower == no) return plist::Value(false);
  }
  return notA("a boolean", text, "true, yes, on or 1, or false, no, off or 0");
}

}  // namespace

Expected<plist::Value> parseArgument(std::string_view text, ArgumentKind kind) {
  switch (kind) {
    case ArgumentKind::Text:
      break;
    case ArgumentKind::Boolean:
      return parseBoolean(text);
    case ArgumentKind::Integer:
      if (const auto number = parseNumber<std::int64_t>(text)) return plist::Value(*number);
      if (const auto number = parseNumber<std::uint64_t>(text)) return plist::Value(*number);
      return notA("an integer", text, "a decimal number of at most 64 bits");
    case ArgumentKind::Real:
      if (const auto number = parseNumber<double>(text)) return plist::Value(*number);
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
