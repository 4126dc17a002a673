#include "platform/linux/logs/file_submission.h"

#include <algorithm>
#include <cerrno>
#include <utility>

#include "base/civil_time.h"
#include "base/limits.h"
#include "platform/linux/files/folder_walk.h"
#include "platform/linux/files/stamp.h"
#include "platform/linux/files/system_error.h"
#include "platform/linux/logs/log_file_name.h"
#include "platform/persisted_state.h"

namespace tavrel {
namespace {

constexpr std::string_view kFolder = "/var/mobile/Library/Logs/Submission";

constexpr std::size_t kWithheldLogs = 8;

// Logs are readable only by their owner and a group of operators; withheld logs only by their
// owner.
constexpr mode_t kMode = 0640;
constexpr mode_t kWithheldMode = 0600;

std::string join(const std::string& folder, std::string_view name, std::string_view ending) {
  std::string path = folder;
  path += '/';
  path += name;
  path += ending;
  return path;
}

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
    : folder_(root.path(kFolder)),
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

// The switch may have been turned off by hand, or a deletion cut short. Unreadable preferences may
// hold a permission: then nothing is sent, and nothing deleted.
void FileSubmission::completeWithdrawal() {
  const auto stored = storedSubmissionPermission(services_.filePreferences);
  if (!stored || stored->isGiven) return;
  if (stored->firstDay) {
    setSubmissionPermission(services_.preferences, {});
    services_.preferences.ZTXPreferencesSynchronize(kDiagnosticsDomain);
  }
  const RemovedLogs removed = removeLogs({folder(Place::Pending), folder(Place::Outbox)}, true);
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
    if (Status made = files_.makePrivateFolder(folder(place)); !made) return made;
  }
  const std::string name = newLogFileName(logName, now);
  Expected<NewFile> file = files_.create(join(folder(place), name, kLogEnding),
                                         place == Place::Withheld ? kWithheldMode : kMode);
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
  const std::string metadataPath = join(folder(place), name, kLogMetadataEnding);
  Status done = files_.replace(metadataPath, asBytes(metadata), isWithheld ? kWithheldMode : kMode);
  if (done) {
    removeOldMetadata(place, metadataPath);
    done = file.commit();
  }
  if (!done) {
    // The log goes first: a visible log always has its metadata.
    files_.discard(join(folder(place), name, kLogEnding));
    files_.discard(metadataPath);
    return done;
  }
  if (isWithheld) {
    log_.log(LogLevel::Info, "log \"%s\" is withheld: submission is %s", name,
             textOf(submissionPermission(services_.preferences)));
    keepNewestLogs(files_, folder(place), kWithheldLogs, name);
  }
  return Done{};
}

Status FileSubmission::checkPermission() const {
  const auto stored = storedSubmissionPermission(services_.filePreferences);
  if (!stored) return stored.error();
  if (!stored->isGiven) return Error{"submission is not allowed"};
  return Done{};
}

// Without `FileSystem::list`: building a sorted list takes several times as long as reading the
// folder.
Expected<FileSubmission::Files> FileSubmission::countFiles(Place place) const {
  const std::string path = folder(place);
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

// Removes metadata left by a process that was killed while filing a log. Ages are measured by the
// file system's own clock, from the timestamp of a file made just now.
void FileSubmission::removeOldMetadata(Place place, const std::string& freshMetadata) {
  // Plus one, because the log being filed has only its metadata so far.
  const auto counts = countFiles(place);
  if (!counts || counts->metadata <= counts->logs + 1) return;
  const auto fresh = FileSystem::status(freshMetadata);
  const auto names = files_.list(folder(place));
  if (!fresh || !names) return;
  for (const std::string& file : *names) {
    const std::string name = withoutEnding(file, kLogMetadataEnding);
    const std::string log = std::string(name).append(kLogEnding);
    if (name.empty() || std::ranges::binary_search(*names, log)) continue;
    const std::string path = join(folder(place), file, {});
    const auto found = FileSystem::status(path);
    if (found && fresh->st_mtim.tv_sec - found->st_mtim.tv_sec > limits::kTemporaryFileSeconds) {
      files_.discard(path);
    }
  }
}

void FileSubmission::submitDiagnosticLogs() {
  if (Status permitted = checkPermission(); !permitted) {
    log_.log(LogLevel::Info, "no log is moved to the outbox: %s", permitted.error().message);
    return;
  }
  const auto files = files_.list(folder(Place::Pending));
  if (!files) {
    log_.write(LogLevel::Error, files.error().message);
    return;
  }
  for (const std::string& file : *files) {
    std::string name = withoutEnding(file, kLogEnding);
    if (name.empty()) {
      // Metadata moves after its log. Left over here, its log has already moved, before it in this
      // list or before a process was killed.
      name = withoutEnding(file, kLogMetadataEnding);
      if (!name.empty() && !FileSystem::status(join(folder(Place::Pending), name, kLogEnding)) &&
          FileSystem::status(join(folder(Place::Outbox), name, kLogEnding))) {
        files_.discard(join(folder(Place::Pending), file, {}));
      }
      continue;
    }
    // A log that another process has sent on or deleted in the meantime needs no log line.
    if (Status moved = moveToOutbox(name);
        !moved && FileSystem::status(join(folder(Place::Pending), file, {}))) {
      log_.log(LogLevel::Error, "cannot move log \"%s\" to the outbox: %s", name,
               moved.error().message);
    }
  }
}

Status FileSubmission::moveToOutbox(const std::string& name) {
  const auto lock = files_.lockFolder(folder_);
  if (!lock) return lock.error();
  if (Status permitted = checkPermission(); !permitted) return permitted;
  const std::string outbox = folder(Place::Outbox);
  const std::string metadataPath = join(folder(Place::Pending), name, kLogMetadataEnding);
  const auto metadata = files_.readIfPresent(metadataPath, limits::kPropertyListBytes);
  if (!metadata) return metadata.error();
  const Status ready =
      *metadata ? files_.replace(join(outbox, name, kLogMetadataEnding), asBytes(**metadata), kMode)
                : files_.makeFolders(outbox);
  if (!ready) return ready;
  return files_.rename(join(folder(Place::Pending), name, kLogEnding),
                       join(outbox, name, kLogEnding));
}

Expected<std::vector<FileSubmission::FiledLog>> FileSubmission::files(Place place) {
  const auto files = files_.list(folder(place));
  if (!files) return files.error();
  std::vector<FiledLog> logs;
  for (const std::string& file : *files) {
    std::string name = withoutEnding(file, kLogEnding);
    if (name.empty()) continue;
    logs.push_back({place, std::move(name), join(folder(place), file, {}), {}});
  }
  return logs;
}

Expected<std::size_t> FileSubmission::count(Place place) const {
  const auto files = countFiles(place);
  if (!files) return files.error();
  return files->logs;
}

void FileSubmission::readMetadata(FiledLog& log) {
  const auto bytes = files_.readIfPresent(join(folder(log.place), log.name, kLogMetadataEnding),
                                          limits::kPropertyListBytes);
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
  if (!stored || stored->isGiven) return 0;
  std::size_t waiting = 0;
  for (const Place place : {Place::Pending, Place::Outbox}) {
    const auto found = count(place);
    waiting += found ? *found : 0;
  }
  return waiting;
}

RemovedLogs FileSubmission::removeWaiting() {
  return removeLogs({folder(Place::Pending), folder(Place::Outbox)}, false);
}

RemovedLogs FileSubmission::removeAll() {
  return removeLogs({folder(Place::Pending), folder(Place::Outbox), folder(Place::Withheld),
                     folder(Place::Refused)},
                    false);
}

// Logs move from pending to the outbox; with the folders in this order none escapes.
RemovedLogs FileSubmission::removeLogs(const std::vector<std::string>& folders,
                                       bool onlyWithoutPermission) {
  if (!FileSystem::status(folder_)) return {};
  const auto lock = files_.lockFolder(folder_);
  if (!lock) return {0, lock.error()};
  if (onlyWithoutPermission) {
    const auto stored = storedSubmissionPermission(services_.filePreferences);
    if (!stored || stored->isGiven) return {};
  }
  return removeLogsIn(files_, folders);
}

std::string FileSubmission::folder(Place place) const {
  constexpr const char* kNames[] = {"/pending", "/outbox", "/withheld", "/refused"};
  return folder_ + kNames[static_cast<std::size_t>(place)];
}

}  // namespace tavrel
