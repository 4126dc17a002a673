#include "platform/linux/logs/log_folder.h"

#include <algorithm>
#include <set>
#include <utility>

#include "platform/linux/logs/log_file_name.h"

namespace tavrel {
namespace {

bool isFolder(const std::string& path) {
  const auto status = FileSystem::status(path);
  return status && S_ISDIR(status->st_mode);
}

}  // namespace

std::string withoutEnding(const std::string& file, std::string_view ending) {
  return file.ends_with(ending) ? file.substr(0, file.size() - ending.size()) : std::string();
}

RemovedLogs removeLogsIn(FileSystem& files, const std::vector<std::string>& folders) {
  RemovedLogs removed;
  std::set<std::string> names;
  const auto note = [&removed](const Status& status) {
    if (!status && !removed.failure) removed.failure = status.error();
  };
  for (const std::string& folder : folders) {
    const auto entries = files.list(folder);
    if (!entries) {
      note(entries.error());
      continue;
    }
    std::set<std::string> stuck;
    for (const std::string_view ending : {kLogEnding, kLogMetadataEnding}) {
      for (const std::string& entry : *entries) {
        std::string name = withoutEnding(entry, ending);
        if (name.empty() || stuck.contains(name)) continue;
        std::string path = folder;
        path += '/';
        path += entry;
        if (Status gone = files.remove(path); !gone) {
          if (!isFolder(path)) note(gone);
          stuck.insert(std::move(name));
        } else if (ending == kLogEnding) {
          names.insert(std::move(name));
        }
      }
    }
    files.discardTemporaries(folder);
    note(files.flushFolder(folder));
  }
  removed.logs = names.size();
  return removed;
}

void keepNewestLogs(FileSystem& files, const std::string& folder, std::size_t count,
                    const std::string& fresh) {
  const auto entries = files.list(folder);
  if (!entries) return;
  std::vector<std::pair<std::int64_t, std::string>> logs;  // by their seconds
  for (const std::string& entry : *entries) {
    std::string name = withoutEnding(entry, kLogEnding);
    const auto known = parseLogFileName(name);
    if (known && name != fresh) logs.emplace_back(known->seconds, std::move(name));
  }
  if (logs.size() < count) return;
  std::sort(logs.begin(), logs.end());
  logs.resize(logs.size() - (count - 1));
  for (const auto& [seconds, name] : logs) {
    for (const std::string_view ending : {kLogEnding, kLogMetadataEnding}) {
      std::string path = folder;
      path += '/';
      path += name;
      path += ending;
      files.discard(path);
    }
  }
}

}  // namespace tavrel
