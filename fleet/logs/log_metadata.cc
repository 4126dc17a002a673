#include "fleet/logs/log_metadata.h"

#include <utility>

#include "base/ascii.h"
#include "base/format.h"
#include "base/utf8.h"
#include "fleet/logs/limits.h"
#include "platform/plist/coding.h"
#include "platform/submission.h"
#include "platform/tallied_log.h"

namespace tavrel::fleet {
namespace {

std::string textOf(const plist::Dictionary& dictionary, std::string_view key) {
  const auto text = dictionary.get(key).string();
  return text ? std::string(*text) : std::string();
}

void setOption(LogMetadata& metadata, std::string_view key, std::string value) {
  if (key == kConfigNumberOption) {
    metadata.configNumber = std::move(value);
  } else if (key == kPreviousOSVersionOption && value != kUnknownText) {
    // The first log of a device says here that there was no earlier version.
    metadata.previousOsVersion = std::move(value);
  }
}

// The log's name, when the file is named like a submitted log: NAME-YYYYMMDDTHHMMSSZ-XXXXXXXX.log
std::string_view logNameOf(std::string_view fileName) {
  constexpr std::string_view kForm = "-########T######Z-xxxxxxxx.log";
  if (fileName.size() <= kForm.size()) return {};
  const std::size_t at = fileName.size() - kForm.size();
  for (std::size_t i = 0; i < kForm.size(); ++i) {
    const char found = fileName[at + i];
    const bool fits = kForm[i] == '#'   ? isDigit(found)
                      : kForm[i] == 'x' ? hexDigit(found).has_value()
                                        : found == kForm[i];
    if (!fits) return {};
  }
  return fileName.substr(0, at);
}

}  // namespace

std::string faultOf(const LogMetadata& metadata) {
  const std::pair<const char*, const std::string&> texts[] = {
      {"the log type", metadata.logType},
      {"the OS version", metadata.osVersion},
      {"the previous OS version", metadata.previousOsVersion},
      {"the configuration number", metadata.configNumber}};
  for (const auto& [name, text] : texts) {
    if (text.size() > limits::kTextBytes)
      return format("%s has more than %zu bytes", name, limits::kTextBytes);
    if (!isValidUtf8(text)) return format("%s is not UTF-8", name);
  }
  return "";
}

Expected<LogMetadata> readMetadataFile(ByteSpan document) {
  const auto value = plist::read(document);
  if (!value) return value.error();
  const plist::Dictionary dictionary = value->dictionary();
  LogMetadata metadata;
  metadata.logType = textOf(dictionary, kLogMetadataType);
  metadata.osVersion = textOf(dictionary, kLogMetadataVersion);
  const plist::Dictionary options = dictionary.dictionary(kLogMetadataOptions);
  for (const std::string_view key : {kPreviousOSVersionOption, kConfigNumberOption})
    setOption(metadata, key, textOf(options, key));
  if (std::string fault = faultOf(metadata); !fault.empty()) return Error{std::move(fault)};
  return metadata;
}

std::string percentDecoded(std::string_view text) {
  std::string decoded;
  decoded.reserve(text.size());
  for (std::size_t i = 0; i < text.size(); ++i) {
    if (text[i] == '%' && i + 2 < text.size()) {
      const auto high = hexDigit(text[i + 1]);
      const auto low = hexDigit(text[i + 2]);
      if (high && low) {
        decoded += static_cast<char>(*high * 16 + *low);
        i += 2;
        continue;
      }
    }
    decoded += text[i];
  }
  return decoded;
}

void readOptions(std::string_view options, LogMetadata& metadata) {
  while (!options.empty()) {
    const std::string_view option = options.substr(0, options.find('&'));
    options.remove_prefix(std::min(option.size() + 1, options.size()));
    const std::size_t equals = option.find('=');
    if (equals == std::string_view::npos) continue;
    setOption(metadata, percentDecoded(option.substr(0, equals)),
              percentDecoded(option.substr(equals + 1)));
  }
}

bool isOtherLog(std::string_view fileName, const LogMetadata* metadata) {
  if (metadata != nullptr && !metadata->logType.empty())
    return metadata->logType != kTalliedLogType;
  const std::string_view name = logNameOf(fileName);
  return !name.empty() && name != kTalliedLogName;
}

}  // namespace tavrel::fleet
