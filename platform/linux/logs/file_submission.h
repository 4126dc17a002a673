// Diagnostic-log submission through folders.
//
// Finished logs wait in /var/mobile/Library/Logs/Submission/pending/ and go on from
// .../Submission/outbox/, which an uploader empties. A log is "<name>-<stamp>-<unique>.log"; its
// metadata is a property list beside it, "<name>-<stamp>-<unique>.metadata.plist".
//
// Only logs that the owner permits get there (submission_permission.h). Other logs of statistics
// are not filed at all. The rest go to .../Submission/withheld/, which is never sent, which only
// root reads, and which keeps the newest eight.
//
// A process that files, moves or deletes waiting logs locks the folder Submission and then reads
// the permission from storage: after a withdrawal nothing is filed or sent on.
//
// log_folder.h says what holds for all of these folders.
#pragma once

#include <initializer_list>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "platform/clock.h"
#include "platform/linux/device/linux_system_version.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/logs/day_noting_store.h"
#include "platform/linux/logs/log_folder.h"
#include "platform/linux/logs/submission_permission.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/preferences.h"
#include "platform/property_list_coding.h"
#include "platform/submission.h"
#include "platform/system_log.h"

namespace tavrel {

class FileSubmission final : public SubmissionService {
 public:
  enum class Place { Pending, Outbox, Withheld, Refused };

  /// A log that has been filed.
  struct FiledLog {
    Place place;
    std::string name;            // of its file, without the ending
    std::string path;            // on this machine
    plist::Dictionary metadata;  // empty when missing or unreadable
  };

  struct Services {
    FileSystem& files;
    PropertyListCoding& propertyLists;
    Preferences& preferences;          // as the run sees them
    FilePreferences& filePreferences;  // as storage has them
    DayNotingStore& reportedDays;      // the store that daily logs report
    LinuxSystemVersion& systemVersion;
    Clock& clock;
    SystemLog& log;
  };
  /// All services must outlive it. With `changesNothing`, logs that wait without permission are
  /// kept.
  FileSubmission(const DeviceRoot& root, const Services& services, bool changesNothing = false);

  /// Whether yesterday's statistics may leave; if the owner has allowed only later days, an info
  /// line says so. A run asks before it makes its log. When the switch is off, this deletes all
  /// waiting logs, as `removeWaiting` does, and a first day left over from an earlier permission.
  bool isDiagnosticSubmissionEnabled() override;
  bool isPermissionReadable() override;
  bool hasInternalDiagnostics(std::string_view identifier) override;
  bool ZTXWriteLogForSubmission(std::string_view logType, std::string_view logName,
                                const plist::Dictionary& options, const LogWriter& writer) override;
  std::string ZTXOSVersion() override;
  plist::Value ZTXGetDATaskingValue(std::string_view key) override;
  /// Without permission nothing is sent on; an info line says so.
  void submitDiagnosticLogs() override;

  /// Where a log made now, from the rows read last, would go; an error when it would not be filed.
  Expected<Place> placeOfNewLog(std::string_view logType);

  /// An error when storage does not have the owner's permission, without which
  /// `submitDiagnosticLogs` sends nothing on.
  Status checkPermission() const;
  /// How many logs a run would delete, because the permission is withdrawn.
  std::size_t countOfWaiting() const;

  /// Deletes the logs that wait in pending and outbox.
  RemovedLogs removeWaiting();
  /// Deletes the logs of all folders, including withheld logs and those that a server has refused.
  RemovedLogs removeAll();

  /// The logs of one place, sorted by name (see `parseLogFileName`). Opens no file; `metadata` is
  /// empty.
  Expected<std::vector<FiledLog>> files(Place place);
  void readMetadata(FiledLog& log);
  /// The number of logs in a place.
  Expected<std::size_t> count(Place place) const;

  /// The logs of one place with their metadata, oldest first. Opens the metadata of each.
  Expected<std::vector<FiledLog>> logs(Place place);

 private:
  struct Destination {
    Place place;
    std::int64_t day;  // which the permission must cover
  };
  struct Files {
    std::size_t logs = 0;
    std::size_t metadata = 0;
  };

  LogFolder folder(Place place) const;
  std::int32_t today() const;
  Expected<Files> countFiles(Place place) const;
  Expected<Destination> destinationOfNewLog(std::string_view logType);
  Status fileLog(std::string_view logType, std::string_view logName,
                 const plist::Dictionary& options, const LogWriter& writer);
  /// Puts a written log in place, if the permission still covers it.
  Status commit(NewFile& file, const Destination& destination, const std::string& name,
                const std::string& metadata);
  Status moveToOutbox(const std::string& name);
  RemovedLogs removeLogs(std::initializer_list<std::string_view> folders, bool onlyOnceWithdrawn);
  void completeWithdrawal();

  std::string folder_;
  Services services_;
  FileSystem& files_;
  SystemLog& log_;
  bool changesNothing_;
};

}  // namespace tavrel
