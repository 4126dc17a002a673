#include "platform/linux/logs/log_day.h"

#include <cmath>

#include "base/bytes.h"
#include "base/civil_time.h"
#include "base/format.h"
#include "base/iso_date.h"
#include "platform/tallied_log.h"

namespace tavrel {
namespace {

std::optional<std::int32_t> dayIn32Bits(plist::Date start) {
  const double day = std::floor(start.secondsSince1970() / static_cast<double>(kSecondsPerDay));
  if (!(day >= -2147483648.0 && day <= 2147483647.0)) return std::nullopt;
  return static_cast<std::int32_t>(day);
}

// The day of a log in the exact form in which the daemon writes it, found without parsing a log of
// many keys. Text contains no "<", and deeper keys have more tabs, so nothing else matches. Nothing
// for a log in another form.
std::optional<std::int32_t> dayInText(std::string_view text) {
  const std::string before = format("\n\t<key>%s</key>\n\t<date>", kStartDateMember);
  if (!text.ends_with("</plist>\n")) return std::nullopt;
  const std::size_t found = text.rfind(before);
  if (found == text.npos) return std::nullopt;
  text.remove_prefix(found + before.size());
  const auto start = parseIsoInstant(text.substr(0, text.find('<')));
  return start ? dayIn32Bits(*start) : std::nullopt;
}

}  // namespace

std::optional<std::int32_t> dayOfLog(const plist::Dictionary& log) {
  const auto start = log.date(kStartDateMember);
  return start ? dayIn32Bits(*start) : std::nullopt;
}

std::optional<std::int32_t> dayOfLog(std::string_view bytes, PropertyListCoding& propertyLists) {
  if (const auto day = dayInText(bytes)) return day;
  const auto document = propertyLists.decode(asBytes(bytes));
  return document ? dayOfLog(document->dictionary()) : std::nullopt;
}

}  // namespace tavrel
