#include "platform/linux/logs/log_file_name.h"

#include <algorithm>
#include <charconv>

#include "base/ascii.h"
#include "base/civil_time.h"
#include "platform/linux/files/random.h"
#include "platform/linux/files/stamp.h"

namespace tavrel {
namespace {

constexpr std::size_t kLongestNamePart = 64;
constexpr std::size_t kUniqueDigits = 8;

// "YYYYMMDDTHHMMSSZ". Names with years after 9999, which have more digits, are not recognised.
constexpr std::string_view kStampForm = "00000000T000000Z";

std::optional<std::int64_t> secondsOf(std::string_view stamp) {
  const bool hasForm =
      std::equal(stamp.begin(), stamp.end(), kStampForm.begin(), kStampForm.end(),
                 [](char c, char form) { return form == '0' ? isDigit(c) : c == form; });
  if (!hasForm) return std::nullopt;
  const auto numberAt = [&](std::size_t start, std::size_t size) {
    unsigned number = 0;
    std::from_chars(stamp.data() + start, stamp.data() + start + size, number);
    return number;
  };
  const CivilTime time{{numberAt(0, 4), numberAt(4, 2), numberAt(6, 2)},
                       numberAt(9, 2),
                       numberAt(11, 2),
                       numberAt(13, 2)};
  if (!isValid(time.date) || time.hour > 23 || time.minute > 59 || time.second > 59) {
    return std::nullopt;
  }
  return secondsFromCivil(time);
}

}  // namespace

std::string plainLogName(std::string_view logName) {
  std::string part(logName.substr(0, kLongestNamePart));
  for (char& c : part) {
    const bool isPlain = isLetterOrDigit(c) || c == '-' || c == '_' || c == '.';
    if (!isPlain) c = '_';
  }
  if (part.empty() || part[0] == '.') part.insert(0, "_");
  return part;
}

std::string newLogFileName(std::string_view logName, plist::Date now) {
  return plainLogName(logName) + "-" + compactStamp(now) + "-" +
         randomName().substr(0, kUniqueDigits);
}

std::optional<LogFileName> parseLogFileName(std::string_view name) {
  constexpr std::size_t kTail = 1 + kStampForm.size() + 1 + kUniqueDigits;
  if (name.size() <= kTail) return std::nullopt;
  const std::string_view tail = name.substr(name.size() - kTail);
  if (tail[0] != '-' || tail[1 + kStampForm.size()] != '-') return std::nullopt;
  const auto seconds = secondsOf(tail.substr(1, kStampForm.size()));
  if (!seconds) return std::nullopt;
  return LogFileName{name.substr(0, name.size() - kTail), *seconds};
}

}  // namespace tavrel
