// The health of the drives, according to their latest readings.
#include "base/format.h"
#include "base/quantity_text.h"
#include "tools/check/checks.h"
#include "tools/disks/disk_list.h"

namespace tavrel {
namespace {

constexpr CheckFigureKind kProblems{"problems", "tavrel_disk_problems", "",
                                    "Sum of the drive's problems, as the exit status of "
                                    "tavrelctl disks has them: 0 is good."};

CheckState stateOf(const health::Verdict& verdict) {
  if ((verdict.problems & health::kFailing) != 0) return CheckState::Critical;
  if ((verdict.problems & (health::kWorn | health::kErrors)) != 0) return CheckState::Warning;
  return verdict.problems != 0 ? CheckState::Unknown : CheckState::Ok;
}

}  // namespace

void checkDisks(CheckScene& scene) {
  const auto [disks, faults] = findDisks(scene.context);
  for (const Error& fault : faults)
    scene.checks.push_back({"disk", "", CheckState::Unknown, fault.message});
  for (const Disk& disk : disks) {
    Check check{"disk", disk.reading.name, stateOf(disk.verdict), disk.verdict.word()};
    for (const std::string& reason : disk.verdict.reasons)
      check.text += ", " + reason;
    if (disk.age) check.text += format(", read %s ago", ageText(*disk.age));
    check.figures.push_back({&kProblems, static_cast<double>(disk.verdict.problems)});
    scene.checks.push_back(std::move(check));
  }
  if (disks.empty() && faults.empty())
    scene.checks.push_back({"disk", "", CheckState::Ok, "no drive reports its health"});
}

}  // namespace tavrel
