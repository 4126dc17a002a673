#include "platform/linux/logs/file_submission.h"

#include <algorithm>
#include <cerrno>

#include "base/civil_time.h"
#include "base/limits.h"
#include "platform/linux/files/folder_walk.h"
#include "platform/linux/files/system_error.h"
#include "platform/linux/logs/log_file_name.h"
#include "platform/persisted_state.h"

namespace tavrel {
namespace {

// Logs are readable only by their owner and a group of operators; withheld logs only by their
// owner.
constexpr mode_t kMode = 0640;
constexpr mode_t kWithheldMode = 0600;

class SubmittedFile final : public LogFile {
 public:
  explicit SubmittedFile(NewFile& file) : file_(file) {}
  void write(ByteSpan bytes) override {
    if (status_) status_ = file_.write(bytes);
  }
  const Status& status() const { return status_; }

 private:
  NewFile& file_;
  Status status_ = Done{};
};

}  // namespace

FileSubmission::FileSubmission(const DeviceRoot& root, const Services& services,
                               bool changesNothing)
    : folder_(root.path(kSubmissionFolder)),
      services_(services),
      files_(services.files),
      log_(services.log),
      changesNothing_(changesNothing) {}

std::int32_t FileSubmission::today() const {
  return services_.reportedDays.BHDaysSince1970();
}

// Gated and forced runs report yesterday. A run that reports today, still unfinished, gets the same
// answer, and one that names an older day is refused when it files its log.
bool FileSubmission::isDiagnosticSubmissionEnabled() {
  services_.reportedDays.takeEarliest();
  const SubmissionPermission permission = submissionPermission(services_.preferences);
  if (permission.covers(std::int64_t{today()} - 1)) return true;
  if (permission.isGiven) {
    log_.log(LogLevel::Info, "submission is %s%s", textOf(permission),
             permission.isHeldBack()
                 ? ""
                 : ": that day's log is made when the day is over, none before");
  } else if (!changesNothing_) {
    completeWithdrawal();
  }
  return false;
}

bool FileSubmission::isPermissionReadable() {
  return static_cast<bool>(storedSubmissionPermission(services_.filePreferences));
}

// The switch may have been turned off by hand, or a deletion cut short. Preferences that cannot be
// read or have lost the switch may have held a permission: nothing is sent, and nothing deleted.
void FileSubmission::completeWithdrawal() {
  const auto stored = storedSubmissionPermission(services_.filePreferences);
  if (!stored || !stored->isWithdrawn) return;
  if (stored->firstDay) {
    setSubmissionPermission(services_.preferences, {});
    services_.preferences.ZTXPreferencesSynchronize(kDiagnosticsDomain);
  }
  const RemovedLogs removed = removeLogs({kPendingFolder, kOutboxFolder}, true);
  if (removed.logs > 0) {
    log_.log(LogLevel::Default, "submission is not allowed: %zu waiting log%s deleted",
             removed.logs, removed.logs == 1 ? "" : "s");
  }
  if (removed.failure) log_.write(LogLevel::Error, removed.failure->message);
}

bool FileSubmission::hasInternalDiagnostics(std::string_view identifier) {
  return services_.preferences.ZTXPreferencesGetBoolValue(identifier, kDiagnosticsDomain);
}

std::string FileSubmission::ZTXOSVersion() {
  return services_.systemVersion.text();
}

plist::Value FileSubmission::ZTXGetDATaskingValue(std::string_view key) {
  return services_.preferences.ZTXPreferencesGetValue(key, kTaskingDomain);
}

bool FileSubmission::ZTXWriteLogForSubmission(std::string_view logType, std::string_view logName,
                                              const plist::Dictionary& options,
                                              const LogWriter& writer) {
  const Status filed = fileLog(logType, logName, options, writer);
  if (!filed) {
    log_.log(LogLevel::Error, "cannot file log \"%s\": %s", plainLogName(logName),
             filed.error().message);
  }
  return static_cast<bool>(filed);
}

Expected<FileSubmission::Destination> FileSubmission::destinationOfNewLog(
    std::string_view logType) {
  const auto dayRead = services_.reportedDays.takeEarliest();
  // A report that filed no log leaves the day that it read to the run's next log.
  const auto statisticsDay = logType == kTalliedLogType ? dayRead : std::nullopt;
  const std::int64_t day = statisticsDay.value_or(today());
  const SubmissionPermission permission = submissionPermission(services_.preferences);
  if (permission.covers(day)) return Destination{Place::Pending, day};
  if (!statisticsDay) return Destination{Place::Withheld, day};
  return Error{format("it holds statistics of day %lld (%s), and submission is %s", *statisticsDay,
                      dateText(civilFromDays(*statisticsDay)), textOf(permission))};
}

Expected<FileSubmission::Place> FileSubmission::placeOfNewLog(std::string_view logType) {
  const auto destination = destinationOfNewLog(logType);
  if (!destination) return destination.error();
  return destination->place;
}

Status FileSubmission::fileLog(std::string_view logType, std::string_view logName,
                               const plist::Dictionary& options, const LogWriter& writer) {
  const auto destination = destinationOfNewLog(logType);
  if (!destination) return destination.error();
  const Place place = destination->place;
  const plist::Date now = services_.clock.now();
  plist::Dictionary metadata{{kLogMetadataType, logType},
                             {kLogMetadataName, logName},
                             {kLogMetadataTime, now},
                             {kLogMetadataVersion, services_.systemVersion.text()}};
  metadata.set(kLogMetadataOptions, options);
  const auto metadataBytes = services_.propertyLists.encodeXml(metadata);
  if (!metadataBytes) return metadataBytes.error();

  if (place == Place::Withheld) {
    if (Status made = files_.makePrivateFolder(folder(place).path()); !made) return made;
  }
  const std::string name = newLogFileName(logName, now);
  Expected<NewFile> file =
      files_.create(folder(place).logPath(name), place == Place::Withheld ? kWithheldMode : kMode);
  if (!file) return file.error();
  SubmittedFile handle(*file);
  writer(handle);
  if (!handle.status()) return handle.status();
  if (Status flushed = file->flush(); !flushed) return flushed;
  return commit(*file, *destination, name, *metadataBytes);
}

Status FileSubmission::commit(NewFile& file, const Destination& destination,
                              const std::string& name, const std::string& metadata) {
  const Place place = destination.place;
  const bool isWithheld = place == Place::Withheld;
  const auto lock = files_.lockFolder(folder_);
  if (!lock) return lock.error();
  if (!isWithheld) {
    // The permission may have changed since the log was begun, and may now cover only later days.
    const auto stored = storedSubmissionPermission(services_.filePreferences);
    if (!stored) return stored.error();
    if (!stored->covers(destination.day)) return Error{"submission is no longer allowed"};
  }
  LogFolder logs = folder(place);
  Status done = files_.replace(logs.metadataPath(name), asBytes(metadata),
                               isWithheld ? kWithheldMode : kMode);
  if (done) done = file.commit();
  if (!done) {
    // The log goes first: a visible log always has its metadata.
    files_.discard(logs.logPath(name));
    files_.discard(logs.metadataPath(name));
    return done;
  }
  if (const auto counts = countFiles(place); counts && counts->metadata > counts->logs) {
    if (const auto listing = logs.list()) logs.removeOrphans(*listing);
  }
  if (isWithheld) {
    log_.log(LogLevel::Info, "log \"%s\" is withheld: submission is %s", name,
             textOf(submissionPermission(services_.preferences)));
    // A log that stays now goes with a later one.
    static_cast<void>(logs.keepNewest(kWithheldLogs, UINT64_MAX, name, today()));
  }
  return Done{};
}

Status FileSubmission::checkPermission() const {
  const auto stored = storedSubmissionPermission(services_.filePreferences);
  if (!stored) return stored.error();
  if (!stored->isGiven) return Error{"submission is not allowed"};
  return Done{};
}

// Without `LogFolder::list`: building a sorted list takes several times as long as reading the
// folder.
Expected<FileSubmission::Files> FileSubmission::countFiles(Place place) const {
  const std::string path = folder(place).path();
  Files files;
  const int code = walkFolder(path, [&files](const dirent& entry) {
    const std::string_view name = entry.d_name;
    if (name[0] == '.') return true;
    files.logs += name.ends_with(kLogEnding) ? 1U : 0U;
    files.metadata += name.ends_with(kLogMetadataEnding) ? 1U : 0U;
    return true;
  });
  if (code != 0 && code != ENOENT) return systemError("list", path, code);
  return files;
}

void FileSubmission::submitDiagnosticLogs() {
  if (Status permitted = checkPermission(); !permitted) {
    log_.log(LogLevel::Info, "no log is moved to the outbox: %s", permitted.error().message);
    return;
  }
  const LogFolder pending = folder(Place::Pending);
  const auto listing = pending.list();
  if (!listing) {
    log_.write(LogLevel::Error, listing.error().message);
    return;
  }
  for (const std::string& name : listing->logs) {
    // A log that another process has sent on or deleted in the meantime needs no log line.
    if (Status moved = moveToOutbox(name); !moved && FileSystem::status(pending.logPath(name))) {
      log_.log(LogLevel::Error, "cannot move log \"%s\" to the outbox: %s", name,
               moved.error().message);
    }
  }
}

Status FileSubmission::moveToOutbox(const std::string& name) {
  const auto lock = files_.lockFolder(folder_);
  if (!lock) return lock.error();
  if (Status permitted = checkPermission(); !permitted) return permitted;
  return folder(Place::Pending).moveLog(name, folder(Place::Outbox));
}

Expected<std::vector<FileSubmission::FiledLog>> FileSubmission::files(Place place) {
  const LogFolder found = folder(place);
  const auto listing = found.list();
  if (!listing) return listing.error();
  std::vector<FiledLog> logs;
  for (const std::string& name : listing->logs)
    logs.push_back({place, name, found.logPath(name), {}});
  return logs;
}

Expected<std::size_t> FileSubmission::count(Place place) const {
  const auto files = countFiles(place);
  if (!files) return files.error();
  return files->logs;
}

void FileSubmission::readMetadata(FiledLog& log) {
  const auto bytes =
      files_.readIfPresent(folder(log.place).metadataPath(log.name), limits::kPropertyListBytes);
  if (!bytes || !*bytes) return;
  if (const auto value = services_.propertyLists.decode(asBytes(**bytes))) {
    log.metadata = value->dictionary();
  }
}

Expected<std::vector<FileSubmission::FiledLog>> FileSubmission::logs(Place place) {
  auto logs = files(place);
  if (!logs) return logs;
  for (FiledLog& log : *logs)
    readMetadata(log);
  const auto time = [](const FiledLog& log) {
    return log.metadata.date(kLogMetadataTime).value_or(plist::Date::ofDay(0)).secondsSinceEpoch();
  };
  std::stable_sort(logs->begin(), logs->end(),
                   [&](const FiledLog& a, const FiledLog& b) { return time(a) < time(b); });
  return logs;
}

std::size_t FileSubmission::countOfWaiting() const {
  const auto stored = storedSubmissionPermission(services_.filePreferences);
  if (!stored || !stored->isWithdrawn) return 0;
  std::size_t waiting = 0;
  for (const Place place : {Place::Pending, Place::Outbox}) {
    const auto found = count(place);
    waiting += found ? *found : 0;
  }
  return waiting;
}

RemovedLogs FileSubmission::removeWaiting() {
  return removeLogs({kPendingFolder, kOutboxFolder}, false);
}

RemovedLogs FileSubmission::removeAll() {
  return removeLogs({kPendingFolder, kOutboxFolder, kWithheldFolder, kRefusedFolder}, false);
}

// Logs move from pending to the outbox; with the folders in this order none escapes.
RemovedLogs FileSubmission::removeLogs(std::initializer_list<std::string_view> folders,
                                       bool onlyOnceWithdrawn) {
  if (!FileSystem::status(folder_)) return {};
  const auto lock = files_.lockFolder(folder_);
  if (!lock) return {0, lock.error()};
  if (onlyOnceWithdrawn) {
    const auto stored = storedSubmissionPermission(services_.filePreferences);
    if (!stored || !stored->isWithdrawn) return {};
  }
  return removeLogsIn(files_, folder_, folders);
}

LogFolder FileSubmission::folder(Place place) const {
  constexpr std::string_view kNames[] = {kPendingFolder, kOutboxFolder, kWithheldFolder,
                                         kRefusedFolder};
  return {folder_, kNames[static_cast<std::size_t>(place)], files_};
}

}  // namespace tavrel
