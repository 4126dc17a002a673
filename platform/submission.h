// The diagnostic-log submission service: whether and how logs leave the device.
#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "base/bytes.h"
#include "base/plist.h"

namespace tavrel {

/// A new log file, open for writing.
class LogFile {
 public:
  virtual ~LogFile() = default;
  /// Writes all of `bytes`. A failure makes the submission fail; further writes are ignored.
  virtual void write(ByteSpan bytes) = 0;
};

inline constexpr std::string_view kUnknownOSVersion = "unknown";

/// The type of the daily log, the only one that holds rows of the statistics store.
inline constexpr std::string_view kTalliedLogType = "193";

class SubmissionService {
 public:
  using LogWriter = std::function<void(LogFile&)>;

  virtual ~SubmissionService() = default;

  /// Whether the user allows diagnostic submission. Begins a report: ask once, before reading the
  /// statistics that its log will hold. After a withdrawal this deletes the logs that wait.
  virtual bool isDiagnosticSubmissionEnabled() = 0;

  /// False when it cannot be known whether the user allows submission; it then counts as forbidden.
  virtual bool isPermissionReadable() = 0;

  /// Whether internal diagnostics are enabled for the identifier.
  virtual bool hasInternalDiagnostics(std::string_view identifier) = 0;

  /// Files a log for upload: opens it, has `writer` fill it, and makes it appear in one step. An
  /// empty `options` handle means none. False when the log could not be filed; it then leaves
  /// nothing behind, and the system log has the reason.
  virtual bool ZTXWriteLogForSubmission(std::string_view logType, std::string_view logName,
                                        const plist::Dictionary& options,
                                        const LogWriter& writer) = 0;

  /// "name version (build)", or `kUnknownOSVersion`.
  virtual std::string ZTXOSVersion() = 0;

  /// A value that remote tasking sets; null when absent.
  virtual plist::Value ZTXGetDATaskingValue(std::string_view key) = 0;

  /// Sends the pending logs on at once.
  virtual void submitDiagnosticLogs() = 0;
};

}  // namespace tavrel
