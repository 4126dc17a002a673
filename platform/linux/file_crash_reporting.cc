#include "platform/linux/file_crash_reporting.h"

#include <algorithm>
#include <array>

#include "base/civil_time.h"
#include "base/limits.h"
#include "base/uuid.h"
#include "platform/linux/digests.h"
#include "platform/linux/guarded_end.h"
#include "platform/linux/json_line.h"
#include "platform/linux/random.h"
#include "platform/linux/stamp.h"

namespace tavrel {
namespace {

constexpr std::string_view kRecordFolder = "/var/mobile/Library/Logs/CrashReporter/StructuredData";
constexpr std::string_view kRecordEnding = ".jsonl";
constexpr std::string_view kSupportLog = "/var/mobile/Library/Logs/NorvaneCare/support.log";
constexpr mode_t kRecordMode = 0640;

/// The day in the name of a record file; nothing for other files.
std::optional<std::int64_t> dayOfRecordFile(std::string_view file) {
  if (!file.ends_with(kRecordEnding)) return std::nullopt;
  file.remove_suffix(kRecordEnding.size());
  const std::size_t dash = file.find('-');
  if (dash == 0 || dash == std::string_view::npos || file.find_first_not_of("0123456789") != dash) {
    return std::nullopt;
  }
  const auto date = parseDate(file.substr(dash + 1));
  if (!date) return std::nullopt;
  return daysFromCivil(*date);
}

bool isFilled(const std::string& path) {
  const auto status = FileLayer::status(path);
  return status && S_ISREG(status->st_mode) && status->st_size > 0;
}

}  // namespace

FileCrashReporting::~FileCrashReporting() {
  endGuarded(log_, "flush structured records", [this] { flushRecords(); });
}

void FileCrashReporting::FLLogStructuredData(std::uint32_t logType,
                                             const plist::Dictionary& record) {
  const plist::Date now = clock_.now();
  std::string line = "{\"time\":\"" + preciseStamp(now) + "\",\"type\":";
  line += std::to_string(logType);
  line += ",\"record\":";
  appendJson(line, record);
  line += "}\n";

  std::string path = root_.path(kRecordFolder);
  path += '/';
  path += std::to_string(logType);
  path += '-';
  path += dateText(civilFromDays(dayOf(now)));
  path += kRecordEnding;
  const Status appended =
      files_.append(path, asBytes(line), kRecordMode, limits::kStructuredRecordFileBytes);
  if (appended) {
    unflushed_.insert(std::move(path));
  } else if (refused_.insert(std::move(path)).second) {
    log_.log(LogLevel::Error, "structured records of type %u are dropped: %s", logType,
             appended.error().message);
  }
}

void FileCrashReporting::FLDumpAllOldStructuredDataLogs() {
  flushRecords();
  const std::string folder = root_.path(kRecordFolder);
  const auto files = files_.list(folder);
  if (!files) {
    log_.write(LogLevel::Error, files.error().message);
    return;
  }
  const std::int64_t today = dayOf(clock_.now());
  for (const std::string& file : *files) {
    const auto day = dayOfRecordFile(file);
    if (!day || *day >= today - kDaysKept) continue;
    if (Status removed = files_.remove(folder + "/" + file); !removed) {
      log_.write(LogLevel::Error, removed.error().message);
    }
  }
}

void FileCrashReporting::flushRecords() {
  for (const std::string& path : unflushed_) {
    if (Status flushed = files_.flush(path); !flushed) {
      log_.write(LogLevel::Error, flushed.error().message);
    }
  }
  unflushed_.clear();
}

// Only the logs below the first free number move. So a roll that was cut short, which leaves such a
// gap, is taken up again by the next one and costs no log.
void FileCrashReporting::rollNorvaneCareLogs() {
  const std::string log = root_.path(kSupportLog);
  if (!isFilled(log)) return;
  const auto numbered = [&](int number) {
    return number == 0 ? log : log + "." + std::to_string(number);
  };
  int target = 1;
  while (target < kSupportLogsKept && FileLayer::status(numbered(target)))
    ++target;
  for (; target > 0; --target) {
    if (Status moved = files_.rename(numbered(target - 1), numbered(target)); !moved) {
      log_.log(LogLevel::Error, "the support log is not rolled: %s", moved.error().message);
      return;
    }
  }
}

std::string FileCrashReporting::fact(std::string_view devicePath) {
  auto content = files_.readIfPresent(root_.pathOrMachine(devicePath), limits::kSystemFactBytes);
  if (!content || !*content) return {};
  std::string text = *std::move(*content);
  // Device trees end their texts with a null character.
  const auto isBlank = [](char c) { return static_cast<unsigned char>(c) <= 0x20; };
  text.erase(std::find_if_not(text.rbegin(), text.rend(), isBlank).base(), text.end());
  text.erase(text.begin(), std::find_if_not(text.begin(), text.end(), isBlank));
  std::replace_if(text.begin(), text.end(), isBlank, ' ');
  return text;
}

std::string FileCrashReporting::systemIdentifier() {
  const std::string machine = fact("/etc/machine-id");
  const bool isIdentifier =
      machine.size() == 32 && machine.find_first_not_of("0123456789abcdef") == std::string::npos;
  if (!isIdentifier) return "unknown";
  const auto digest = sha256(asBytes("com.norvane.zentrix.tavrel system identifier " + machine));
  std::array<std::byte, 16> identifier;
  std::copy_n(digest.begin(), identifier.size(), identifier.begin());
  return uuidText(identifier);
}

std::string FileCrashReporting::hardwareModel() {
  for (const std::string_view path :
       {"/sys/firmware/devicetree/base/model", "/sys/class/dmi/id/product_name"}) {
    if (std::string model = fact(path); !model.empty()) return model;
  }
  return "unknown";
}

std::string FileCrashReporting::osVersion() {
  return systemVersion_.text();
}

std::string FileCrashReporting::incidentIdentifier() {
  return randomUuidText();
}

}  // namespace tavrel
