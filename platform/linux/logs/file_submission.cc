#include "platform/linux/logs/file_submission.h"

#include <algorithm>
#include <cerrno>
#include <dirent.h>
#include <memory>
#include <utility>

#include "base/limits.h"
#include "platform/linux/files/system_error.h"
#include "platform/linux/logs/log_file_name.h"
#include "platform/persisted_state.h"

namespace tavrel {
namespace {

constexpr std::string_view kFolder = "/var/mobile/Library/Logs/Submission";
constexpr std::string_view kLogEnding = ".log";

// Statistics are readable by their owner and a group of operators only.
constexpr mode_t kMode = 0640;

/// `file` without `ending`; empty when it has another.
std::string withoutEnding(const std::string& file, std::string_view ending) {
  return file.ends_with(ending) ? file.substr(0, file.size() - ending.size()) : std::string();
}

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

FileSubmission::FileSubmission(const DeviceRoot& root, FileSystem& files,
                               PropertyListCoding& propertyLists, Preferences& preferences,
                               LinuxSystemVersion& systemVersion, Clock& clock, SystemLog& log)
    : folder_(root.path(kFolder)),
      files_(files),
      propertyLists_(propertyLists),
      preferences_(preferences),
      systemVersion_(systemVersion),
      clock_(clock),
      log_(log) {}

bool FileSubmission::isDiagnosticSubmissionEnabled() {
  return preferences_.ZTXPreferencesGetBoolValue(kSubmissionEnabledKey, kDiagnosticsDomain);
}

bool FileSubmission::hasInternalDiagnostics(std::string_view identifier) {
  return preferences_.ZTXPreferencesGetBoolValue(identifier, kDiagnosticsDomain);
}

std::string FileSubmission::ZTXOSVersion() {
  return systemVersion_.text();
}

plist::Value FileSubmission::ZTXGetDATaskingValue(std::string_view key) {
  return preferences_.ZTXPreferencesGetValue(key, kTaskingDomain);
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

Status FileSubmission::fileLog(std::string_view logType, std::string_view logName,
                               const plist::Dictionary& options, const LogWriter& writer) {
  const plist::Date now = clock_.now();
  plist::Dictionary metadata{{kLogMetadataType, logType},
                             {kLogMetadataName, logName},
                             {kLogMetadataTime, now},
                             {kLogMetadataVersion, systemVersion_.text()}};
  metadata.set(kLogMetadataOptions, options);
  const auto metadataBytes = propertyLists_.encodeXml(metadata);
  if (!metadataBytes) return metadataBytes.error();

  const std::string name = newLogFileName(logName, now);
  const std::string logPath = join(folder(Place::Pending), name, kLogEnding);
  const std::string metadataPath = join(folder(Place::Pending), name, kLogMetadataEnding);

  Expected<NewFile> file = files_.create(logPath, kMode);
  if (!file) return file.error();
  SubmittedFile handle(*file);
  writer(handle);
  if (!handle.status()) return handle.status();
  if (Status flushed = file->flush(); !flushed) return flushed;

  Status done = files_.replace(metadataPath, asBytes(*metadataBytes), kMode);
  if (done) {
    removeOldMetadata(metadataPath);
    done = file->commit();
  }
  if (!done) {
    // The log goes first: as long as it can be seen, its metadata can.
    files_.discard(logPath);
    files_.discard(metadataPath);
  }
  return done;
}

// Removes what a process left that was killed while filing a log. Ages are measured by the file
// system's own clock, from the stamp of a file made just now.
void FileSubmission::removeOldMetadata(const std::string& freshMetadata) {
  const auto fresh = FileSystem::status(freshMetadata);
  const auto names = files_.list(folder(Place::Pending));
  if (!fresh || !names) return;
  for (const std::string& file : *names) {
    const std::string name = withoutEnding(file, kLogMetadataEnding);
    if (name.empty() || FileSystem::status(join(folder(Place::Pending), name, kLogEnding)))
      continue;
    const std::string path = join(folder(Place::Pending), file, {});
    const auto found = FileSystem::status(path);
    if (found && fresh->st_mtim.tv_sec - found->st_mtim.tv_sec > limits::kTemporaryFileSeconds) {
      files_.discard(path);
    }
  }
}

void FileSubmission::submitDiagnosticLogs() {
  const auto files = files_.list(folder(Place::Pending));
  if (!files) {
    log_.write(LogLevel::Error, files.error().message);
    return;
  }
  for (const std::string& file : *files) {
    std::string name = withoutEnding(file, kLogEnding);
    if (name.empty()) {
      // Metadata follows its log, which precedes it in the list or moved before a process was
      // killed.
      name = withoutEnding(file, kLogMetadataEnding);
      if (!name.empty() && !FileSystem::status(join(folder(Place::Pending), name, kLogEnding)) &&
          FileSystem::status(join(folder(Place::Outbox), name, kLogEnding))) {
        files_.discard(join(folder(Place::Pending), file, {}));
      }
      continue;
    }
    if (Status moved = moveToOutbox(name); !moved) {
      log_.log(LogLevel::Error, "cannot move log \"%s\" to the outbox: %s", name,
               moved.error().message);
    }
  }
}

Status FileSubmission::moveToOutbox(const std::string& name) {
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

// Without a list of names, which takes several times as long to make as to read.
Expected<std::size_t> FileSubmission::count(Place place) const {
  const std::string path = folder(place);
  const std::unique_ptr<DIR, int (*)(DIR*)> open(opendir(path.c_str()), closedir);
  std::size_t count = 0;
  if (!open && errno == ENOENT) return count;
  if (!open) return systemError("list", path);
  errno = 0;
  while (const dirent* entry = readdir(open.get())) {
    const std::string_view name = entry->d_name;
    if (name[0] != '.' && name.ends_with(kLogEnding)) ++count;
  }
  if (errno != 0) return systemError("list", path);
  return count;
}

void FileSubmission::readMetadata(FiledLog& log) {
  const auto bytes = files_.readIfPresent(join(folder(log.place), log.name, kLogMetadataEnding),
                                          limits::kPropertyListBytes);
  if (!bytes || !*bytes) return;
  if (const auto value = propertyLists_.decode(asBytes(**bytes))) {
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

std::string FileSubmission::folder(Place place) const {
  return folder_ + (place == Place::Pending ? "/pending" : "/outbox");
}

}  // namespace tavrel
