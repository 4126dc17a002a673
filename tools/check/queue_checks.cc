// Logs that are waiting, and failures of the uploader.
#include "base/format.h"
#include "base/instant.h"
#include "base/limits.h"
#include "base/quantity_text.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/log_file_name.h"
#include "platform/linux/logs/log_folder.h"
#include "platform/linux/runs/upload_state.h"
#include "platform/plist/coding.h"
#include "tools/check/checks.h"
#include "tools/console/table.h"

namespace tavrel {
namespace {

constexpr CheckFigureKind kLogs{"logs", "tavrel_queue_logs", "", "Logs in a queue."};
constexpr CheckFigureKind kOldest{"oldest_timestamp_seconds",
                                  "tavrel_queue_oldest_timestamp_seconds", "seconds",
                                  "When the oldest log of a queue was filed."};
constexpr CheckFigureKind kFailed{"failed_attempts", "tavrel_upload_failed_attempts", "",
                                  "Attempts to upload that failed in a row."};
constexpr CheckFigureKind kSent{"sent", "tavrel_upload_sent_logs", "", "Logs sent in total."};
constexpr CheckFigureKind kRefused{"refused", "tavrel_upload_refused_logs", "",
                                   "Logs that the server refused in total."};
constexpr CheckFigureKind kSuccess{"success_timestamp_seconds",
                                   "tavrel_upload_success_timestamp_seconds", "seconds",
                                   "When a log was last sent."};

enum class Meaning : std::uint8_t {
  Moves,    // its logs should move on within days
  Rests,    // its logs may stay without anything being wrong
  Refused,  // each log in it is a failure
};

struct Queue {
  std::string_view name;
  Meaning meaning;
};

constexpr Queue kQueues[] = {{kPendingFolder, Meaning::Moves},
                             {kOutboxFolder, Meaning::Moves},
                             {kWithheldFolder, Meaning::Rests},
                             {kRefusedFolder, Meaning::Refused}};

Check queueCheck(CheckScene& scene, const Queue& queue) {
  Check check{"queue", std::string(queue.name)};
  const auto listing = LogFolder(scene.context.root().path(kSubmissionFolder), queue.name,
                                 scene.context.linuxPlatform().fileSystem())
                           .list();
  if (!listing) {
    check.state = CheckState::Unknown;
    check.text = listing.error().message;
    return check;
  }
  const std::size_t logs = listing->logs.size();
  std::optional<std::int64_t> oldest;
  for (const std::string& name : listing->logs) {
    const auto parsed = parseLogFileName(name);
    if (parsed) oldest = std::min(oldest.value_or(parsed->seconds), parsed->seconds);
  }
  check.figures.push_back({&kLogs, static_cast<double>(logs)});
  check.text = logs == 0 ? "empty" : counted(logs, "log");
  if (oldest) {
    check.figures.push_back({&kOldest, static_cast<double>(*oldest)});
    check.text += format(", the oldest filed %s ago", ageText(scene.ageOf(*oldest)));
    if (queue.meaning == Meaning::Moves) check.state = stateOfAge(scene.ageOf(*oldest));
  }
  if (logs > 0 && queue.meaning == Meaning::Refused) check.state = CheckState::Warning;
  return check;
}

void judgeUpload(CheckScene& scene, const UploadState& state, Check& check) {
  const auto& success = state.lastSuccess;
  check.figures = {{&kFailed, static_cast<double>(state.failedAttempts)},
                   {&kSent, static_cast<double>(state.sent)},
                   {&kRefused, static_cast<double>(state.refused)}};
  if (success) check.figures.push_back({&kSuccess, static_cast<double>(wholeSeconds(*success))});
  check.text =
      success ? format("a log was last sent %s ago", ageText(scene.ageOf(*success))) : "never sent";
  if (state.failedAttempts == 0) return;
  // Without a single success, it has never worked.
  check.state = success ? stateOfAge(scene.ageOf(*success)) : CheckState::Warning;
  check.text += format("; %s failed%s: %s",
                       counted(static_cast<std::uint64_t>(state.failedAttempts), "attempt"),
                       success ? " since" : ", the last with",
                       state.failure.empty() ? "reason unknown" : state.failure);
}

}  // namespace

void checkQueues(CheckScene& scene) {
  for (const Queue& queue : kQueues)
    scene.checks.push_back(queueCheck(scene, queue));
}

void checkUpload(CheckScene& scene) {
  Check check{"upload"};
  const std::string path = scene.context.root().path(kUploadStateFile);
  const auto bytes =
      scene.context.linuxPlatform().fileSystem().readIfPresent(path, limits::kSystemFactBytes);
  if (!bytes) {
    check.state = CheckState::Unknown;
    check.text = bytes.error().message;
  } else if (!*bytes) {
    check.text = "no attempt yet";
  } else {
    const auto state = plist::read(asBytes(**bytes));
    if (state && state->dictionary()) {
      judgeUpload(scene, uploadStateOf(state->dictionary()), check);
    } else {
      check.state = CheckState::Unknown;
      check.text = path + " is not a dictionary: the next attempt replaces it";
    }
  }
  scene.checks.push_back(std::move(check));
}

}  // namespace tavrel
