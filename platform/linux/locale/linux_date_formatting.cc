#include "platform/linux/locale/linux_date_formatting.h"

#include <cstdint>
#include <cstdlib>
#include <ctime>
#include <filesystem>
#include <system_error>

#include "base/arithmetic.h"
#include "base/civil_time.h"
#include "base/format.h"
#include "base/instant.h"

namespace tavrel {
namespace {

// Seconds east of UTC at an instant. The C library reads zone files, but lets a program choose one
// only through the environment variable TZ, and looks up a relative path in its own folder.
std::int64_t offsetAt(std::int64_t seconds, const std::string& zoneFile) {
  std::error_code unknown;
  const std::string path = std::filesystem::absolute(zoneFile, unknown).string();
  ::setenv("TZ", (':' + path).c_str(), 1);
  ::tzset();
  const std::time_t instant = seconds;
  std::tm local{};
  return ::localtime_r(&instant, &local) ? local.tm_gmtoff : 0;
}

// The year before year 1 is year 1 of the previous era.
std::int64_t yearOfEra(std::int64_t year) {
  return year > 0 ? year : 1 - year;
}

}  // namespace

std::string LinuxDateFormatting::format(plist::Date date, std::string_view pattern,
                                        std::string_view) {
  const std::int64_t instant = wholeSeconds(date);
  const std::int64_t offset = offsetAt(instant, root_.pathOrMachine("/etc/localtime"));
  const CivilTime time = civilFromSeconds(wrappingAdd(instant, offset));

  std::string text;
  while (!pattern.empty()) {
    const std::size_t end = pattern.find_first_not_of(pattern.front());
    const std::string_view field = pattern.substr(0, end);
    if (field == "yyyy") {
      appendFormat(text, "%04lld", yearOfEra(time.date.year));
    } else if (field == "MM") {
      appendFormat(text, "%02u", time.date.month);
    } else if (field == "dd") {
      appendFormat(text, "%02u", time.date.day);
    } else if (field == "HH") {
      appendFormat(text, "%02u", time.hour);
    } else if (field == "mm") {
      appendFormat(text, "%02u", time.minute);
    } else if (field == "ss") {
      appendFormat(text, "%02u", time.second);
    } else if (field == "Z") {
      const std::int64_t minutes = std::abs(offset / 60);
      appendFormat(text, "%s%02lld%02lld", offset <= -60 ? "-" : "+", minutes / 60, minutes % 60);
    } else {
      text += field;
    }
    pattern.remove_prefix(field.size());
  }
  return text;
}

}  // namespace tavrel
