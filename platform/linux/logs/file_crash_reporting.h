// Crash-reporting support in files.
//
// Structured records are lines of JSON in
// /var/mobile/Library/Logs/CrashReporter/StructuredData/<type>-<UTC day>.jsonl, one file per type
// and day. A call returns once the kernel has the record. Records are flushed to storage together,
// at the clean-up that ends a day's work or when the process ends; that of an ECC event at once,
// since the event then leaves its queue. Until then their files are locked. The support log of
// other programs, /var/mobile/Library/Logs/NorvaneCare/support.log, is rolled to support.log.1 and
// on to support.log.5.
#pragma once

#include <cstdint>
#include <map>
#include <optional>
#include <string>
#include <vector>

#include "platform/clock.h"
#include "platform/crash_reporting.h"
#include "platform/linux/device/ecc_events.h"
#include "platform/linux/device/linux_system_version.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/system_log.h"

namespace tavrel {

class FileCrashReporting final : public CrashReporting {
 public:
  /// The number of days whose structured records are kept, whatever their dates: a wrong clock must
  /// not make all of them old. Beyond that, days after tomorrow go first, then the oldest.
  static constexpr std::size_t kDaysKept = 31;
  /// The number of rolled support logs that are kept.
  static constexpr int kSupportLogsKept = 5;

  FileCrashReporting(const DeviceRoot& root, FileSystem& files, LinuxSystemVersion& systemVersion,
                     EccEvents& eccEvents, Clock& clock, SystemLog& log)
      : root_(root),
        files_(files),
        systemVersion_(systemVersion),
        eccEvents_(eccEvents),
        clock_(clock),
        log_(log) {}
  ~FileCrashReporting() override;

  void FLLogStructuredData(std::uint32_t logType, const plist::Dictionary& record) override;
  void FLDumpAllOldStructuredDataLogs() override;
  void rollNorvaneCareLogs() override;

  /// The files that the clean-up removes, without their folder.
  std::vector<std::string> oldRecordFiles();

  /// Whether there is a support log to roll, one that is not empty.
  bool hasSupportLog();

  /// A UUID derived from the machine's identifier, which itself never leaves the device. The same
  /// for each call; "unknown" on a machine without an identifier.
  std::string systemIdentifier() override;
  /// The model name from the firmware; "unknown" without one.
  std::string hardwareModel() override;
  std::string osVersion() override;
  std::string incidentIdentifier() override;

 private:
  struct RecordFile {
    std::int64_t day;
    std::optional<AppendedFile> file;  // nothing when unusable
    bool isRefusalTold = false;
  };

  void refuse(std::uint32_t type, const Error& error);
  /// Keeps other processes from writing records until `flushRecords`.
  Status lockRecords();
  RecordFile& recordFile(std::uint32_t type, std::int64_t day);
  void flush(RecordFile& file);
  void flushRecords();
  std::string fact(std::string_view devicePath);

  const DeviceRoot& root_;
  FileSystem& files_;
  LinuxSystemVersion& systemVersion_;
  EccEvents& eccEvents_;
  Clock& clock_;
  SystemLog& log_;
  std::map<std::uint32_t, RecordFile> recordFiles_;  // by type
  Descriptor lock_;
};

}  // namespace tavrel
