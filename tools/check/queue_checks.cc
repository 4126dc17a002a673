// Logs that are waiting, and failures of the uploader.
#include "base/format.h"
#include "base/limits.h"
#include "base/quantity_text.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/log_file_name.h"
#include "platform/plist/coding.h"
#include "tools/check/checks.h"
#include "tools/shared/table.h"

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

constexpr std::string_view kFolder = "/var/mobile/Library/Logs/Submission/";
constexpr std::string_view kStateFile = "/var/lib/tavrel/upload/state.plist";

enum class Meaning : std::uint8_t {
  Moves,    // its logs should move on within days
  Rests,    // its logs may stay without anything being wrong
  Refused,  // each log in it is a failure
};

struct Queue {
  std::string_view name;
  Meaning meaning;
};

constexpr Queue kQueues[] = {{"pending", Meaning::Moves},
                             {"outbox", Meaning::Moves},
                             {"withheld", Meaning::Rests},
                             {"refused", Meaning::Refused}};

Check queueCheck(CheckScene& scene, const Queue& queue) {
  Check check{"queue", std::string(queue.name)};
  const auto names = scene.context.linuxPlatform().fileSystem().list(
      scene.context.root().path(std::string(kFolder).append(queue.name)));
  if (!names) {
    check.state = CheckState::Unknown;
    check.text = names.error().message;
    return check;
  }
  constexpr std::string_view kEnding = ".log";
  std::uint64_t logs = 0;
  std::optional<std::int64_t> oldest;
  for (std::string_view name : *names) {
    if (!name.ends_with(kEnding)) continue;
    ++logs;
    name.remove_suffix(kEnding.size());
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

void addFigure(Check& check, const CheckFigureKind& kind, const plist::Dictionary& state,
               std::string_view key) {
  if (const auto number = state.number(key)) check.figures.push_back({&kind, number->real()});
}

void judgeUpload(CheckScene& scene, const plist::Dictionary& state, Check& check) {
  const auto failed = state.number("FailedAttempts");
  const auto success = state.date("LastSuccess");
  addFigure(check, kFailed, state, "FailedAttempts");
  addFigure(check, kSent, state, "Sent");
  addFigure(check, kRefused, state, "Refused");
  if (success) check.figures.push_back({&kSuccess, static_cast<double>(secondsOf(*success))});
  check.text =
      success ? format("a log was last sent %s ago", ageText(scene.ageOf(*success))) : "never sent";
  if (!failed || failed->int64() <= 0) return;
  // Without a single success, it has never worked.
  check.state = success ? stateOfAge(scene.ageOf(*success)) : CheckState::Warning;
  check.text += format(
      "; %s failed%s: %s", counted(static_cast<std::uint64_t>(failed->int64()), "attempt"),
      success ? " since" : ", the last with", state.string("Failure").value_or("reason unknown"));
}

}  // namespace

void checkQueues(CheckScene& scene) {
  for (const Queue& queue : kQueues)
    scene.checks.push_back(queueCheck(scene, queue));
}

void checkUpload(CheckScene& scene) {
  Check check{"upload"};
  const std::string path = scene.context.root().path(kStateFile);
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
      judgeUpload(scene, state->dictionary(), check);
    } else {
      check.state = CheckState::Unknown;
      check.text = path + " is not a dictionary: the next attempt replaces it";
    }
  }
  scene.checks.push_back(std::move(check));
}

}  // namespace tavrel
