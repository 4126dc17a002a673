#include "storage/parse/nand_log_writer.h"

#include <algorithm>

#include "base/format.h"
#include "base/text.h"
#include "base/utf8.h"
#include "platform/platform_exception.h"

namespace tavrel {
namespace {

constexpr std::string_view kDatePattern = "yyyy-MM-dd HH:mm:ss Z";
constexpr std::string_view kDateLocale = "en_US_POSIX";

bool isNumber(const plist::Value& value) {
  return value.number().has_value() || value.boolean().has_value();
}

void appendElements(std::string& out, const plist::Array& array) {
  std::string_view separator;
  for (const plist::Value& element : array) {
    out += separator;
    separator = ",";
    appendText(out, element);
  }
}

// Appends "key:value;" for a number or an array with numbers, nothing for other values.
void appendItem(std::string& out, const plist::Entry& entry) {
  const auto number = entry.value.number();
  const auto array = entry.value.array();
  if (!isNumber(entry.value) && std::none_of(array.begin(), array.end(), isNumber)) return;
  out += entry.key;
  out += ':';
  if (number && number->isFloating()) {
    appendFormat(out, "%.2f", number->real());
  } else if (array) {
    appendElements(out, array);
  } else {
    appendText(out, entry.value);
  }
  out += ';';
}

std::string bodyOf(const plist::Dictionary& statistics) {
  std::string body;
  for (const plist::Entry& entry : statistics)
    appendItem(body, entry);
  if (!body.empty()) body.pop_back();
  return body;
}

std::string logText(Platform& platform, plist::Date now, const plist::Dictionary& statistics) {
  const std::string date = platform.dateFormatting->format(now, kDatePattern, kDateLocale);
  const std::string body = bodyOf(statistics);
  const std::string line = format("%@ %@[%d]: %@\n", date, platform.process->name(),
                                  platform.process->identifier(), body);
  CrashReporting& support = platform.crashReporting;
  const std::string system = support.systemIdentifier();
  const std::string hardware = support.hardwareModel();
  const std::string version = support.osVersion();
  const std::string incident = support.incidentIdentifier();
  return format(
      "System ID: %@\nHardware Model: %@\nOS Version: %@\nDate: %@\nIncident ID: %@\n"
      "Faultline Key: %@\n\n%@",
      system, hardware, version, date, incident, GetFaultlineKey(platform.deviceAnswers), line);
}

void writeLog(Platform& platform, std::string_view logType, const plist::Dictionary& statistics) {
  const plist::Date now = platform.clock->now();
  const auto last =
      platform.preferences->ZTXPreferencesGetValue(kNandLogLastLoggedKey, kDefaultPreferenceDomain)
          .date();
  if (last && now - *last < kNandLogPeriod) {
    platform.log->log(LogLevel::Default, "NANDLogWriter:Last written at %@ current %@ :skipped",
                      *last, now);
    return;
  }
  if (!statistics) return;

  const std::string text = repairedUtf8(logText(platform, now, statistics));
  // Whatever the result, the next attempt is a whole period later, to spare a failing service.
  platform.submission->ZTXWriteLogForSubmission(
      logType, kNandLogName, {}, [&text](LogFile& file) { file.write(asBytes(text)); });
  platform.preferences->ZTXPreferencesSetValue(kNandLogLastLoggedKey, now,
                                               kDefaultPreferenceDomain);
  platform.preferences->ZTXPreferencesSynchronize(kDefaultPreferenceDomain);
}

}  // namespace

void NLW_WriteLog(Platform& platform, std::string_view logType,
                  const plist::Dictionary& statistics) {
  try {
    writeLog(platform, logType, statistics);
  } catch (const PlatformException& exception) {
    platform.log->log(LogLevel::Error, "An exception occurred: %@", exception.name());
  }
}

std::string GetFaultlineKey(DeviceAnswers& deviceAnswers) {
  const plist::Value answer = deviceAnswers.SQCopyAnswer("InverseDeviceID");
  return std::string(answer.string().value_or("error"));
}

}  // namespace tavrel
