// What programs record: limits that were reached, values that were lost, and folds.
#include <ctime>
#include <string>
#include <unistd.h>

#include "base/arithmetic.h"
#include "base/format.h"
#include "base/quantity_text.h"
#include "platform/linux/folding/fold_notes.h"
#include "platform/linux/folding/segment_folder.h"
#include "platform/linux/linux_platform.h"
#include "tools/check/checks.h"
#include "tools/shared/table.h"
#include "tools/stat/recorded.h"

namespace tavrel {
namespace {

constexpr CheckFigureKind kReached{"removed", "tavrel_limits_removed", "",
                                   "What limits removed since yesterday began, UTC."};
constexpr CheckFigureKind kLost{"values", "tavrel_recording_lost_values", "",
                                "Values that programs lost since yesterday began, UTC."};
constexpr CheckFigureKind kSegments{"segments", "tavrel_folding_segments", "",
                                    "Segments of recording programs."};
constexpr CheckFigureKind kRows{"rows", "tavrel_folding_waiting_rows", "",
                                "Statistics with values that wait to be folded."};

struct Counter {
  std::string_view prefix;
  std::string text;
  double sum = 0;

  void add(std::string_view key, std::int64_t value) {
    constexpr std::size_t kShownBytes = 300;
    if (!key.starts_with(prefix) || value <= 0) return;
    sum += static_cast<double>(value);
    if (text.size() < kShownBytes)
      text += format("%s%s %lld", text.empty() ? "" : ", ", key.substr(prefix.size()), value);
  }

  Check check(std::string_view name, const CheckFigureKind& kind) const {
    return {name,
            "",
            sum > 0 ? CheckState::Warning : CheckState::Ok,
            sum > 0 ? "since yesterday: " + text : "none since yesterday",
            {{&kind, sum}}};
  }
};

void checkCounters(CheckScene& scene) {
  Counter reached{"com.norvane.tavrel.limits.", {}};
  Counter lost{"com.norvane.brimhold.", {}};
  auto history = openRecorded(scene.context, {.key = "com.norvane.",
                                              .firstDay = previousDay(scene.today),
                                              .lastDay = scene.today,
                                              .hasValues = false});
  const Status read = history ? history->walkScalars([&](std::string_view key, std::int32_t,
                                                         std::int64_t value, bool&) {
    reached.add(key, value);
    lost.add(key, value);
  })
                              : Status(history.error());
  if (!read) {
    const std::string& message = read.error().message;
    scene.checks.push_back({"limits", "", CheckState::Unknown, message});
    scene.checks.push_back({"lost-values", "", CheckState::Unknown, message});
    return;
  }
  scene.checks.push_back(reached.check("limits", kReached));
  scene.checks.push_back(lost.check("lost-values", kLost));
}

// Since a fold last took values. Everything that waits is gone at the next start of the system, so
// no value is older than that.
std::int64_t longestWait(const CheckScene& scene) {
  timespec uptime{};
  clock_gettime(CLOCK_BOOTTIME, &uptime);
  const timespec mark = FoldNotes::lastMark(scene.context.root());
  return std::min<std::int64_t>(uptime.tv_sec, scene.ageOf(mark.tv_sec));
}

Check foldingCheck(CheckScene& scene, const SegmentFolder& folder) {
  Check check{"folding"};
  LinuxPlatform& device = scene.context.linuxPlatform();
  const auto listing = folder.list();
  if (!listing) {
    check.state = CheckState::Unknown;
    check.text = listing.error().message;
    return check;
  }
  const auto segments = listing->segments.size();
  check.figures.push_back({&kSegments, static_cast<double>(segments)});
  const auto user = geteuid();
  for (const SegmentEntry& entry : listing->segments) {
    if (user == 0 || entry.owner == user) continue;
    check.state = CheckState::Unknown;
    check.text = "segments of other users cannot be read: run as root";
    return check;
  }
  const Recorders recorders =
      Recorders::read(scene.context.root(), device.fileSystem(), device.platform().propertyLists,
                      device.platform().log);
  const auto history = scene.context.storeForReading().openHistory();
  const auto waiting =
      history ? WaitingValues::read(
                    folder, recorders, history->get(),
                    {.key = "", .firstDay = kFirstDay, .lastDay = kLastDay, .hasValues = false})
              : Expected<WaitingValues>(history.error());
  if (!waiting) {
    check.state = CheckState::Unknown;
    check.text = waiting.error().message;
    return check;
  }
  const auto rows = waiting->scalars().size() + waiting->distributions().size();
  check.figures.push_back({&kRows, static_cast<double>(rows)});
  check.text = counted(segments, "segment");
  if (rows == 0) {
    check.text += ", nothing waits";
    return check;
  }
  const std::int64_t wait = longestWait(scene);
  check.state = stateOfAge(wait);
  check.text += format(", %s with values that wait, for %s at most", counted(rows, "statistic"),
                       ageText(wait));
  if (waiting->leftOut() > 0) {
    check.state = graver(check.state, CheckState::Warning);
    check.text +=
        format("; %lld more than a fold reads", static_cast<long long>(waiting->leftOut()));
  }
  return check;
}

}  // namespace

void checkRecording(CheckScene& scene) {
  checkCounters(scene);
  const auto folder = SegmentFolder::open(scene.context.root());
  if (!folder) {
    // Another user than root may not look.
    const bool isClosed = access(scene.context.root().path("/run/tavrel/stat").c_str(), R_OK) != 0;
    const auto state = isClosed ? CheckState::Unknown : CheckState::Critical;
    scene.checks.push_back({"folding", "", state, folder.error().message});
  } else if (!*folder) {
    scene.checks.push_back({"folding", "", CheckState::Ok, "no program records in memory"});
  } else {
    scene.checks.push_back(foldingCheck(scene, **folder));
  }
}

}  // namespace tavrel
