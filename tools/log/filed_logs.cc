#include "tools/log/filed_logs.h"

#include <algorithm>
#include <functional>
#include <tuple>

#include "base/format.h"
#include "base/instant.h"
#include "base/limits.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/log_file_name.h"
#include "platform/plist/coding.h"
#include "tools/console/table.h"

namespace tavrel {
namespace {

// The second since 1970 in which a log was filed; a log without metadata counts as the oldest.
std::optional<std::int64_t> secondOf(const FiledLog& log) {
  const auto time = log.metadata.date(kLogMetadataTime);
  return time ? std::optional(wholeSeconds(*time)) : std::nullopt;
}

// The order in which logs were filed. Metadata gives the second, and the file's time refines it.
// File times advance in steps, within which names decide.
bool isOlder(const FiledLog& a, const FiledLog& b) {
  const auto order = [](const FiledLog& log) {
    const timespec modified = log.status ? log.status->st_mtim : timespec{};
    return std::tuple(secondOf(log), modified.tv_sec, modified.tv_nsec, std::string_view(log.name));
  };
  return order(a) < order(b);
}

// False for a folder, whatever its name. Fills in the status.
bool isRegular(FiledLog& log) {
  log.status = FileSystem::status(log.path);
  return !log.status || S_ISREG(log.status->st_mode);
}

// The logs of all folders, as their file names describe them.
Expected<std::vector<FiledLog>> filesOfLogs(ToolContext& context, std::vector<Unseen>& unseen) {
  using enum FileSubmission::Place;
  std::vector<FiledLog> logs;
  for (const auto place : {Withheld, Refused, Outbox, Pending}) {
    auto found = context.linuxPlatform().submission().files(place);
    // Only root may see withheld logs, and on some devices refused ones; other users get the rest.
    if (!found && (place == Withheld || place == Refused)) {
      unseen.push_back({found.error(), place});
      continue;
    }
    if (!found) return found.error();
    for (FileSubmission::FiledLog& log : *found)
      logs.push_back({std::move(log), std::nullopt});
  }
  return logs;
}

// The second in which a log was filed, from its name or else its metadata.
std::optional<std::int64_t> secondFiled(ToolContext& context, FiledLog& log) {
  if (const auto known = parseLogFileName(log.name)) return known->seconds;
  context.linuxPlatform().submission().readMetadata(log);
  return secondOf(log);
}

// Reads each log's metadata, drops entries that are not files, and sorts the rest.
void readFacts(ToolContext& context, std::vector<FiledLog>& logs) {
  std::erase_if(logs, [](FiledLog& log) { return !isRegular(log); });
  for (FiledLog& log : logs)
    context.linuxPlatform().submission().readMetadata(log);
  std::stable_sort(logs.begin(), logs.end(), isOlder);
}

}  // namespace

std::string_view nameOf(FileSubmission::Place place) {
  constexpr std::string_view kNames[] = {kPendingFolder, kOutboxFolder, kWithheldFolder,
                                         kRefusedFolder};
  return kNames[static_cast<std::size_t>(place)];
}

LogEnvelope envelopeOf(const FiledLog& log) {
  return {std::string(nameOf(log.place)), log.path, log.metadata};
}

std::string fileNameOf(const FiledLog& log) {
  return log.path.substr(log.path.rfind('/') + 1);
}

Expected<FiledLogs> filedLogs(ToolContext& context, std::size_t most) {
  std::vector<Unseen> unseen;
  auto files = filesOfLogs(context, unseen);
  if (!files) return files.error();
  FiledLogs filed{*std::move(files), 0, std::move(unseen)};
  if (filed.logs.size() > most) {
    // Sorts positions rather than logs, which are costly to move.
    std::vector<std::pair<std::optional<std::int64_t>, std::size_t>> seconds;
    seconds.reserve(filed.logs.size());
    for (FiledLog& log : filed.logs)
      seconds.emplace_back(secondFiled(context, log), seconds.size());
    const auto end = seconds.begin() + static_cast<std::ptrdiff_t>(most);
    std::ranges::nth_element(seconds, end, std::greater<>());
    std::vector<FiledLog> newest;
    newest.reserve(most);
    for (auto place = seconds.begin(); place != end; ++place)
      newest.push_back(std::move(filed.logs[place->second]));
    filed.older = filed.logs.size() - most;
    filed.logs = std::move(newest);
  }
  readFacts(context, filed.logs);
  return filed;
}

Expected<std::vector<FiledLog>> filedLogsNamed(ToolContext& context, std::string_view name,
                                               std::vector<Unseen>& unseen) {
  auto logs = filesOfLogs(context, unseen);
  if (!logs) return logs;
  // A log in both folders, for example after a power cut, is still waiting.
  const auto named = std::find_if(logs->rbegin(), logs->rend(), [&](FiledLog& log) {
    return (name == log.path || name == log.name || name == fileNameOf(log)) && isRegular(log);
  });
  if (named != logs->rend()) {
    context.linuxPlatform().submission().readMetadata(*named);
    unseen.clear();
    return std::vector{std::move(*named)};
  }
  if (name.find('/') != std::string_view::npos) return std::vector<FiledLog>();
  std::erase_if(*logs, [name](const FiledLog& log) { return !log.name.starts_with(name); });
  readFacts(context, *logs);
  return logs;
}

Expected<std::optional<FiledLog>> newestLog(ToolContext& context, std::string_view namePrefix,
                                            const std::function<bool(const FiledLog&)>& accepts,
                                            std::vector<Unseen>& unseen) {
  FileSubmission& submission = context.linuxPlatform().submission();
  auto files = filesOfLogs(context, unseen);
  if (!files) return files.error();
  std::vector<std::pair<std::optional<std::int64_t>, FiledLog>> candidates;
  for (FiledLog& log : *files) {
    const auto known = parseLogFileName(log.name);
    if (!known) submission.readMetadata(log);
    const std::string_view logName =
        known ? known->logName : log.metadata.string(kLogMetadataName).value_or(log.name);
    if (!logName.starts_with(namePrefix)) continue;
    const auto second = known ? std::optional(known->seconds) : secondOf(log);
    candidates.emplace_back(second, std::move(log));
  }
  std::stable_sort(candidates.begin(), candidates.end(),
                   [](const auto& a, const auto& b) { return a.first < b.first; });
  while (!candidates.empty()) {
    const auto sameSecond =
        std::find_if(candidates.begin(), candidates.end(),
                     [&](const auto& entry) { return entry.first == candidates.back().first; });
    std::vector<FiledLog> newest;
    for (auto entry = sameSecond; entry != candidates.end(); ++entry) {
      if (!isRegular(entry->second)) continue;
      submission.readMetadata(entry->second);
      newest.push_back(std::move(entry->second));
    }
    candidates.erase(sameSecond, candidates.end());
    std::stable_sort(newest.begin(), newest.end(), isOlder);
    const auto found = std::find_if(newest.rbegin(), newest.rend(), accepts);
    if (found != newest.rend()) return std::optional(std::move(*found));
  }
  return std::optional<FiledLog>();
}

void noteMissingMetadata(ToolContext& context, const std::vector<FiledLog>& logs) {
  const auto isBare = [](const FiledLog& log) { return log.metadata.empty(); };
  const auto first = std::find_if(logs.begin(), logs.end(), isBare);
  if (first == logs.end()) return;
  const std::string path = first->path.substr(0, first->path.rfind('/') + 1) + first->name +
                           std::string(kLogMetadataEnding);
  const auto bytes = context.linuxPlatform().fileSystem().read(path, limits::kPropertyListBytes);
  const auto value = bytes ? plist::read(asBytes(*bytes)) : Expected<plist::Value>(bytes.error());
  const bool isThere = value && !value->dictionary().empty();
  std::string reason = isThere ? path + ": it could not be read at first: run the command again"
                       : value ? path + ": it is empty or not a dictionary"
                               : value.error().message;
  if (bytes && !value) reason = path + ": " + reason;
  // Unreadable metadata is a failure; missing metadata may just be the result of a kill.
  if (isThere || (!bytes && FileSystem::status(path))) context.setExitStatus(kExitFailure);
  context.note(format(
      "%s without metadata: %s",
      counted(static_cast<std::uint64_t>(std::count_if(logs.begin(), logs.end(), isBare)), "log"),
      reason));
}

}  // namespace tavrel
