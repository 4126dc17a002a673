#include "fleet/logs/xml_value.h"

#include <string>

#include "base/iso_date.h"
#include "platform/plist/scalar_text.h"

namespace tavrel::fleet {
namespace {

constexpr std::string_view kSpace = " \t\n\r";

std::string_view trimmed(std::string_view text) {
  if (!text.empty() && text.front() > ' ' && text.back() > ' ') return text;
  const std::size_t first = text.find_first_not_of(kSpace);
  if (first == std::string_view::npos) return {};
  return text.substr(first, text.find_last_not_of(kSpace) - first + 1);
}

bool refuse(LogBuilder& builder, std::string_view text, std::string_view wanted) {
  constexpr std::size_t kShownBytes = 40;
  std::string reason = "\"";
  reason.append(text.substr(0, kShownBytes)).append("\" is not ").append(wanted);
  return builder.fail(reason);
}

}  // namespace

bool buildValue(LogBuilder& builder, XmlValue element, std::string_view text) {
  switch (element) {
    case XmlValue::Key:
      return builder.key(text);
    case XmlValue::String:
      return builder.string(text);
    case XmlValue::Integer:
      if (const auto number = plist::parseInteger(trimmed(text))) return builder.integer(*number);
      return refuse(builder, text, "a 64-bit integer");
    case XmlValue::Real:
      if (const auto number = plist::parseReal(trimmed(text))) return builder.real(*number);
      return refuse(builder, text, "a number in the range of a double");
    case XmlValue::Date:
      if (const auto date = parseIsoInstant(trimmed(text))) return builder.date(*date);
      return refuse(builder, text, "a date of the form YYYY-MM-DDTHH:MM:SSZ");
    default:
      return builder.other();
  }
}

}  // namespace tavrel::fleet
