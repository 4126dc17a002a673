// What programs record: limits reached, values lost, and folding.
#include <algorithm>
#include <ctime>
#include <string>
#include <unistd.h>

#include "base/arithmetic.h"
#include "base/format.h"
#include "base/quantity_text.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/folding/fold_notes.h"
#include "platform/linux/folding/recorded_history.h"
#include "platform/linux/folding/recorders.h"
#include "platform/linux/folding/segment_folder.h"
#include "platform/linux/limits/tidy.h"
#include "platform/linux/linux_platform.h"
#include "tools/check/checks.h"
#include "tools/console/table.h"
#include "tools/stat/recorded.h"

namespace tavrel {
namespace {

constexpr CheckFigureKind kReached{"removed", "tavrel_limits_removed", "",
                                   "What limits removed early since yesterday began, UTC."};
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

  /// `gap`: why some of it may have been missed; empty when nothing was.
  Check check(std::string_view name, std::string_view whenNone, const CheckFigureKind& kind,
              const std::string& gap) const {
    if (sum == 0 && !gap.empty()) return {name, "", CheckState::Unknown, gap};
    return {name,
            "",
            sum > 0 ? CheckState::Warning : CheckState::Ok,
            sum > 0 ? "since yesterday: " + text : format("%s since yesterday", whenNone),
            {{&kind, sum}}};
  }
};

// Of any level: a user who does not exist is only an info, but what such a user records is lost.
struct FirstLine final : SystemLog {
  void write(LogLevel, std::string_view message) override {
    if (text.empty()) text = message;
  }
  std::string text;
};

constexpr const char* kClosedSegments = "segments of other users cannot be read: run as root";

bool hasClosedSegments(const SegmentFolder::Listing& listing) {
  const auto user = geteuid();
  return user != 0 && std::ranges::any_of(listing.segments, [user](const SegmentEntry& entry) {
           return entry.owner != user;
         });
}

// Why limits may not be enforced: a fault in their file, or a failure of the last tidy.
void judgeTidying(CheckScene& scene, Check& check) {
  LinuxPlatform& device = scene.context.linuxPlatform();
  const auto limits =
      DeviceLimits::read(device.root(), device.fileSystem(), device.platform().propertyLists);
  if (!limits) {
    const bool mayRead = !FileSystem::isClosed(device.root().path(kLimitsPath));
    return addFinding(check, mayRead ? CheckState::Warning : CheckState::Unknown,
                      limits.error().message);
  }
  const std::string path = device.root().path(kTidyFailuresFile);
  const auto failures = device.fileSystem().readIfPresent(path, limits::kSystemFactBytes);
  const auto status = FileSystem::status(path);
  if (!failures || !*failures || !status) return;
  addFinding(
      check, CheckState::Warning,
      format("'tavrelctl tidy' failed %s ago: %s", ageText(scene.ageOf(status->st_mtim.tv_sec)),
             std::string_view(**failures).substr(0, (*failures)->find('\n'))));
}

void checkCounters(CheckScene& scene, const Recorders& recorders,
                   const Expected<std::optional<SegmentFolder>>& folder) {
  Counter reached{"com.norvane.tavrel.limits.", {}};
  Counter lost{"com.norvane.brimhold.", {}};
  auto history =
      RecordedHistory::open(scene.context.root(), scene.context.storeForReading(), recorders,
                            {.key = "com.norvane.",
                             .firstDay = previousDay(scene.today),
                             .lastDay = scene.today,
                             .hasValues = false});
  const std::string_view expired = kKeptKinds[static_cast<std::size_t>(Kept::Store)].statistic;
  const Status read = history ? history->walkScalars([&](std::string_view key, std::int32_t,
                                                         std::int64_t value, bool&) {
    // A store as old as its limit loses one day each day, as intended.
    if (key != expired) reached.add(key, value);
    lost.add(key, value);
  })
                              : Status(history.error());
  std::string gap;
  if (!read) {
    gap = read.error().message;
  } else if (const auto warnings = history->warnings(); !warnings.empty()) {
    gap = warnings.front();
  }
  if (gap.empty() && folder && *folder) {
    const auto listing = (*folder)->list();
    if (listing && hasClosedSegments(*listing)) gap = kClosedSegments;
  }
  Check limits = reached.check("limits", "nothing removed early", kReached, gap);
  judgeTidying(scene, limits);
  scene.checks.push_back(std::move(limits));
  scene.checks.push_back(lost.check("lost-values", "none", kLost, gap));
}

// Seconds since a fold last took values. A restart of the system discards everything that waits, so
// no value is older than the uptime.
std::int64_t longestWait(const CheckScene& scene) {
  timespec uptime{};
  clock_gettime(CLOCK_BOOTTIME, &uptime);
  const timespec mark = FoldNotes::lastMark(scene.context.root());
  return std::min<std::int64_t>(uptime.tv_sec, scene.ageOf(mark.tv_sec));
}

Check foldingCheck(CheckScene& scene, const Recorders& recorders, const SegmentFolder& folder) {
  Check check{"folding"};
  const auto listing = folder.list();
  if (!listing) {
    check.state = CheckState::Unknown;
    check.text = listing.error().message;
    return check;
  }
  const auto segments = listing->segments.size();
  check.figures.push_back({&kSegments, static_cast<double>(segments)});
  if (hasClosedSegments(*listing)) {
    check.state = CheckState::Unknown;
    check.text = kClosedSegments;
    return check;
  }
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
  const std::uint64_t leftOut = waiting->leftOut();
  const std::uint64_t withoutRights = waiting->withoutRights();
  if (rows == 0 && leftOut == 0 && withoutRights == 0) {
    check.text += ", nothing waits";
    return check;
  }
  const std::int64_t wait = longestWait(scene);
  check.state = stateOfAge(wait);
  check.text += rows > 0 ? format(", %s with values that wait, for %s at most",
                                  counted(rows, "statistic"), ageText(wait))
                         : format(", no fold took values for %s", ageText(wait));
  if (leftOut > 0) {
    addFinding(check, CheckState::Warning, counted(leftOut, "segment") + " not read");
  }
  if (withoutRights > 0) {
    addFinding(check, CheckState::Warning,
               counted(withoutRights, "segment") + " with values that cannot be folded now");
  }
  return check;
}

}  // namespace

void checkRecording(CheckScene& scene) {
  const DeviceRoot& root = scene.context.root();
  LinuxPlatform& device = scene.context.linuxPlatform();
  FirstLine fault;
  const Recorders recorders =
      Recorders::read(root, device.fileSystem(), device.platform().propertyLists, fault);
  const auto folder = SegmentFolder::open(root);
  checkCounters(scene, recorders, folder);
  if (!folder) {
    // Only root may look into the folder.
    const bool isUnseen = access(root.path(kSegmentFolder).c_str(), R_OK) != 0;
    const auto state = isUnseen ? CheckState::Unknown : CheckState::Critical;
    scene.checks.push_back({"folding", "", state, folder.error().message});
  } else if (!*folder) {
    scene.checks.push_back({"folding", "", CheckState::Ok, "no program records in memory"});
  } else {
    scene.checks.push_back(foldingCheck(scene, recorders, **folder));
  }
  if (!fault.text.empty()) {
    const bool isUnseen = FileSystem::isClosed(root.path(kRecordersFile));
    addFinding(scene.checks.back(), isUnseen ? CheckState::Unknown : CheckState::Warning,
               fault.text);
  }
}

}  // namespace tavrel
