#include "tools/log/filed_logs.h"

#include <algorithm>
#include <cmath>
#include <tuple>

#include "base/format.h"
#include "base/limits.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/plist/coding.h"
#include "tools/shared/table.h"

namespace tavrel {
namespace {

// The order in which logs were filed. Metadata tells the second, the file the rest.
bool isOlder(const FiledLog& a, const FiledLog& b) {
  const auto order = [](const FiledLog& log) {
    const auto time = log.metadata.date(kLogMetadataTime);
    const timespec modified = log.status ? log.status->st_mtim : timespec{};
    return std::tuple(time ? std::floor(time->secondsSinceEpoch()) : -HUGE_VAL, modified.tv_sec,
                      modified.tv_nsec);
  };
  return order(a) < order(b);
}

}  // namespace

std::string_view nameOf(FileSubmission::Place place) {
  return place == FileSubmission::Place::Pending ? "pending" : "outbox";
}

std::string fileNameOf(const FiledLog& log) {
  return log.path.substr(log.path.rfind('/') + 1);
}

Expected<std::vector<FiledLog>> filedLogs(ToolContext& context) {
  FileSubmission& submission = context.linuxPlatform().submission();
  std::vector<FiledLog> logs;
  for (const auto place : {FileSubmission::Place::Outbox, FileSubmission::Place::Pending}) {
    auto found = submission.logs(place);
    if (!found) return found.error();
    for (FileSubmission::FiledLog& log : *found) {
      auto status = FileSystem::status(log.path);
      if (status && !S_ISREG(status->st_mode)) continue;
      logs.push_back({std::move(log), status});
    }
  }
  std::stable_sort(logs.begin(), logs.end(), isOlder);
  return logs;
}

void noteMissingMetadata(ToolContext& context, const std::vector<FiledLog>& logs) {
  const auto isBare = [](const FiledLog& log) { return log.metadata.empty(); };
  const auto first = std::find_if(logs.begin(), logs.end(), isBare);
  if (first == logs.end()) return;
  const std::string path = first->path.substr(0, first->path.rfind('/') + 1) + first->name +
                           std::string(kLogMetadataEnding);
  const auto bytes = context.linuxPlatform().fileSystem().read(path, limits::kPropertyListBytes);
  const auto value = bytes ? plist::read(asBytes(*bytes)) : Expected<plist::Value>(bytes.error());
  std::string reason = value ? path + ": it is empty or no dictionary" : value.error().message;
  if (bytes && !value) reason = path + ": " + reason;
  context.note(format(
      "%s without metadata: %s",
      counted(static_cast<std::uint64_t>(std::count_if(logs.begin(), logs.end(), isBare)), "log"),
      reason));
}

}  // namespace tavrel
