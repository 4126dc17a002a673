#include "platform/linux/logs/file_crash_reporting.h"

#include <algorithm>
#include <array>
#include <iterator>
#include <set>
#include <utility>

#include "base/instant.h"
#include "base/limits.h"
#include "base/uuid.h"
#include "platform/guarded.h"
#include "platform/linux/files/digests.h"
#include "platform/linux/files/random.h"
#include "platform/linux/files/stamp.h"
#include "platform/linux/logs/json_line.h"
#include "platform/linux/logs/record_file_name.h"

namespace tavrel {
namespace {

constexpr std::string_view kSupportLog = "/var/mobile/Library/Logs/NorvaneCare/support.log";
constexpr mode_t kRecordMode = 0640;
constexpr std::uint32_t kEccRecordType = 172;

bool isFilled(const std::string& path) {
  const auto status = FileSystem::status(path);
  return status && S_ISREG(status->st_mode) && status->st_size > 0;
}

}  // namespace

FileCrashReporting::~FileCrashReporting() {
  runGuarded(log_, "flush structured records", [this] { flushRecords(); });
}

void FileCrashReporting::FLLogStructuredData(std::uint32_t logType,
                                             const plist::Dictionary& record) {
  const plist::Date now = clock_.now();
  RecordFile& records = recordFile(logType, dayOf(now));
  if (!records.file) return;

  std::string line = "{\"time\":\"" + preciseStamp(now) + "\",\"type\":";
  line += std::to_string(logType);
  line += ",\"record\":";
  appendJson(line, record);
  line += "}\n";
  Status filed = records.file->append(asBytes(line), limits::kStructuredRecordFileBytes);
  if (filed && logType == kEccRecordType) filed = records.file->flush();
  if (!filed) {
    if (!std::exchange(records.isRefusalTold, true)) refuse(logType, filed.error());
  } else if (logType == kEccRecordType) {
    eccEvents_.filed();
  }
}

void FileCrashReporting::refuse(std::uint32_t type, const Error& error) {
  log_.log(LogLevel::Error, "structured records of type %u %s: %s", type,
           type == kEccRecordType ? "wait for the next run" : "are dropped", error.message);
}

Status FileCrashReporting::lockRecords() {
  if (lock_) return Done{};
  const std::string folder = root_.path(kRecordFolder);
  if (Status made = files_.makeFolders(folder); !made) return made;
  auto lock = files_.lockFolder(folder);
  if (!lock) return lock.error();
  lock_ = *std::move(lock);
  return Done{};
}

// A file that cannot be opened is not tried again for each record: each try may wait for the lock.
FileCrashReporting::RecordFile& FileCrashReporting::recordFile(std::uint32_t type,
                                                               std::int64_t day) {
  const auto known = recordFiles_.find(type);
  if (known != recordFiles_.end() && known->second.day == day) return known->second;
  if (known != recordFiles_.end()) flush(known->second);

  RecordFile& records = recordFiles_[type] = {day, {}, false};
  std::string path = root_.path(kRecordFolder);
  path += '/';
  path += recordFileName({type, day});
  const Status locked = lockRecords();
  auto file = locked ? files_.openToAppend(path, kRecordMode) : locked.error();
  if (file) {
    records.file = *std::move(file);
  } else {
    refuse(type, file.error());
  }
  return records;
}

std::vector<std::string> FileCrashReporting::oldRecordFiles() {
  auto files = files_.list(root_.path(kRecordFolder));
  if (!files) {
    log_.write(LogLevel::Error, files.error().message);
    return {};
  }
  // Days in order of removal.
  const std::int64_t tomorrow = dayOf(clock_.now()) + 1;
  const auto rank = [tomorrow](const RecordFileName& file) {
    return std::pair(file.day <= tomorrow, file.day);
  };
  std::set<std::pair<bool, std::int64_t>> days;
  for (const std::string& name : *files) {
    if (const auto file = parseRecordFileName(name)) days.insert(rank(*file));
  }
  if (days.size() <= kDaysKept) return {};
  const auto firstKept = *std::prev(days.end(), kDaysKept);
  std::erase_if(*files, [&](const std::string& name) {
    const auto file = parseRecordFileName(name);
    return !file || rank(*file) >= firstKept;
  });
  return *std::move(files);
}

void FileCrashReporting::FLDumpAllOldStructuredDataLogs() {
  flushRecords();
  for (const std::string& name : oldRecordFiles()) {
    std::string path = root_.path(kRecordFolder);
    path += '/';
    path += name;
    if (Status removed = files_.remove(path); !removed) {
      log_.write(LogLevel::Error, removed.error().message);
    }
  }
}

void FileCrashReporting::flush(RecordFile& records) {
  if (!records.file) return;
  if (Status flushed = records.file->flush(); !flushed) {
    log_.write(LogLevel::Error, flushed.error().message);
  }
}

void FileCrashReporting::flushRecords() {
  for (auto& [type, records] : recordFiles_)
    flush(records);
  recordFiles_.clear();
  lock_.reset();
}

bool FileCrashReporting::hasSupportLog() {
  return isFilled(root_.path(kSupportLog));
}

// Moves only the logs below the first free number. A roll that was cut short leaves such a gap; the
// next roll closes it, and no log is lost.
void FileCrashReporting::rollNorvaneCareLogs() {
  if (!hasSupportLog()) return;
  const std::string log = root_.path(kSupportLog);
  const auto numbered = [&](int number) {
    return number == 0 ? log : log + "." + std::to_string(number);
  };
  int target = 1;
  while (target < kSupportLogsKept && FileSystem::status(numbered(target)))
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
  // Device-tree strings end with a null character.
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
