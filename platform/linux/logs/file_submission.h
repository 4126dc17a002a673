// Diagnostic-log submission through folders.
//
// Finished logs wait in /var/mobile/Library/Logs/Submission/pending/ and go on from
// .../Submission/outbox/, which an uploader empties. A log is "<name>-<stamp>-<unique>.log"; its
// metadata is a property list beside it, "<name>-<stamp>-<unique>.metadata.plist".
//
// The metadata appears before the log and disappears after it, so each visible log has its
// metadata. Metadata without a log comes from a killed process, means nothing, and is removed once
// it is older than `limits::kTemporaryFileSeconds`.
#pragma once

#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "platform/clock.h"
#include "platform/linux/device/linux_system_version.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/preferences.h"
#include "platform/property_list_coding.h"
#include "platform/submission.h"
#include "platform/system_log.h"

namespace tavrel {

/// The end of the name of a log's metadata, which begins as the log's.
inline constexpr std::string_view kLogMetadataEnding = ".metadata.plist";

/// Entries of a log's metadata.
inline constexpr std::string_view kLogMetadataType = "LogType";       // string
inline constexpr std::string_view kLogMetadataName = "LogName";       // string
inline constexpr std::string_view kLogMetadataTime = "Time";          // date
inline constexpr std::string_view kLogMetadataVersion = "OSVersion";  // string
inline constexpr std::string_view kLogMetadataOptions = "Options";    // dictionary, when given

class FileSubmission final : public SubmissionService {
 public:
  enum class Place { Pending, Outbox };

  /// A log that has been filed.
  struct FiledLog {
    Place place;
    std::string name;            // of its file, without the ending
    std::string path;            // on this machine
    plist::Dictionary metadata;  // empty when missing or unreadable
  };

  FileSubmission(const DeviceRoot& root, FileSystem& files, PropertyListCoding& propertyLists,
                 Preferences& preferences, LinuxSystemVersion& systemVersion, Clock& clock,
                 SystemLog& log);

  bool isDiagnosticSubmissionEnabled() override;
  bool hasInternalDiagnostics(std::string_view identifier) override;
  bool ZTXWriteLogForSubmission(std::string_view logType, std::string_view logName,
                                const plist::Dictionary& options, const LogWriter& writer) override;
  std::string ZTXOSVersion() override;
  plist::Value ZTXGetDATaskingValue(std::string_view key) override;
  void submitDiagnosticLogs() override;

  /// The logs of one place in the order of their names, which `parseLogFileName` reads; no file is
  /// opened and `metadata` is empty.
  Expected<std::vector<FiledLog>> files(Place place);
  void readMetadata(FiledLog& log);
  /// How many there are.
  Expected<std::size_t> count(Place place) const;

  /// The logs of one place with their metadata, oldest first. Opens the metadata of each.
  Expected<std::vector<FiledLog>> logs(Place place);

 private:
  std::string folder(Place place) const;
  Status fileLog(std::string_view logType, std::string_view logName,
                 const plist::Dictionary& options, const LogWriter& writer);
  Status moveToOutbox(const std::string& name);
  void removeOldMetadata(const std::string& freshMetadata);

  std::string folder_;
  FileSystem& files_;
  PropertyListCoding& propertyLists_;
  Preferences& preferences_;
  LinuxSystemVersion& systemVersion_;
  Clock& clock_;
  SystemLog& log_;
};

}  // namespace tavrel
