#include "platform/linux/limits/kept_files.h"

#include <algorithm>
#include <map>
#include <set>
#include <span>

#include "base/civil_time.h"
#include "platform/linux/device/ecc_events.h"
#include "platform/linux/files/stamp.h"
#include "platform/linux/logs/record_file_name.h"
#include "platform/linux/preferences/file_preferences.h"

namespace tavrel {
namespace {

constexpr std::string_view kSetAsideFolders[] = {"/var/mobile/Library/Brimhold", kPreferencesFolder,
                                                 kEccEventFolder};
constexpr std::string_view kSetAsideMark = ".corrupt-";  // a stamp follows
constexpr std::int64_t kBlockBytes = 4096;

std::string_view folderOf(Kept kind) {
  switch (kind) {
    case Kept::Pending:
      return kPendingFolder;
    case Kept::Outbox:
      return kOutboxFolder;
    case Kept::Withheld:
      return kWithheldFolder;
    default:
      return kRefusedFolder;
  }
}

// A sparse or damaged file may claim any size: above all bounds, but sums must not wrap.
std::int64_t blocksOf(const struct stat& status) {
  constexpr std::int64_t kMost = std::int64_t{1} << 41;
  const std::int64_t size = std::min(std::int64_t{status.st_size}, kMost);
  return (size + kBlockBytes - 1) / kBlockBytes * kBlockBytes;
}

// Preferences in use may have the mark in their name, too; only their files end in ".plist".
bool isSetAside(std::string_view name) {
  return (name.find(kSetAsideMark) != name.npos && !name.ends_with(".plist")) ||
         name.ends_with("-kept-damaged") || name.ends_with(".unusable");
}

}  // namespace

std::int64_t KeptFile::day() const {
  return dayOfSecond(seconds);
}

Expected<Descriptor> KeptFiles::lock(Kept kind, const DeviceRoot& root, FileSystem& files) {
  if (kind == Kept::Records || kind == Kept::SetAside) return Descriptor();
  const std::string folder =
      root.path(kind == Kept::EccEvents ? kEccEventFolder : kSubmissionFolder);
  return FileSystem::status(folder) ? files.lockFolder(folder) : Descriptor();
}

Expected<KeptFiles> KeptFiles::list(Kept kind, const DeviceRoot& root, FileSystem& files,
                                    std::int64_t today) {
  KeptFiles kept(kind, files, today);
  Status listed = Done{};
  switch (kind) {
    case Kept::Records:
      kept.folder_ = root.path(kRecordFolder);
      listed = kept.listRecords();
      break;
    case Kept::EccEvents:
      kept.folder_ = root.path(kEccEventFolder);
      listed = kept.listEvents();
      break;
    case Kept::SetAside:
      for (const std::string_view folder : kSetAsideFolders) {
        if (listed) listed = kept.listSetAside(root.path(folder));
      }
      break;
    default:
      listed = kept.listLogs({root.path(kSubmissionFolder), folderOf(kind), files});
      break;
  }
  if (!listed) return listed.error();
  std::ranges::sort(kept.list_, {}, [today](const KeptFile& file) {
    return removalKey(file.seconds, file.path, today);
  });
  return kept;
}

// A file that has gone, or is not a regular file, does not count.
void KeptFiles::add(const std::string& path, std::int64_t seconds) {
  const auto status = FileSystem::status(path);
  if (!status || !S_ISREG(status->st_mode)) return;
  list_.push_back({path, {}, seconds, blocksOf(*status)});
}

Status KeptFiles::listLogs(const LogFolder& folder) {
  folder_ = folder.path();
  const auto listing = folder.list();
  if (!listing) return listing.error();
  for (const std::string& name : listing->orphans)
    orphans_.push_back(folder.metadataPath(name));
  for (const std::string& name : listing->logs) {
    const auto status = FileSystem::status(folder.logPath(name));
    if (!status || !S_ISREG(status->st_mode)) continue;
    list_.push_back(
        {folder.logPath(name), folder.metadataPath(name), folder.timeOf(name), blocksOf(*status)});
    KeptFile& log = list_.back();
    if (const auto metadata = FileSystem::status(log.companion)) log.bytes += blocksOf(*metadata);
  }
  return Done{};
}

Status KeptFiles::listRecords() {
  const auto names = fileSystem_.list(folder_);
  if (!names) return names.error();
  for (const std::string& name : *names) {
    const auto file = parseRecordFileName(name);
    if (file) add(folder_ + '/' + name, file->day * kSecondsPerDay);
  }
  return Done{};
}

// Events are taken in the order of their names, which is also their age.
Status KeptFiles::listEvents() {
  const auto names = fileSystem_.list(folder_);
  if (!names) return names.error();
  for (const std::string& name : *names) {
    if (name.ends_with(".event") || name.ends_with(".errno")) add(folder_ + '/' + name, 0);
  }
  return Done{};
}

Status KeptFiles::listSetAside(const std::string& folder) {
  const auto names = fileSystem_.list(folder);
  if (!names) return names.error();
  for (const std::string& name : *names) {
    if (!isSetAside(name)) continue;
    const auto status = FileSystem::status(folder + '/' + name);
    if (!status) continue;
    // A store may have been set aside long after its last change.
    const auto stamp = std::string_view(name).find(kSetAsideMark);
    const auto day = stamp == name.npos
                         ? std::nullopt
                         : dayInStamp(std::string_view(name).substr(stamp + kSetAsideMark.size()));
    add(folder + '/' + name,
        std::max(std::int64_t{status->st_mtim.tv_sec}, day.value_or(0) * kSecondsPerDay));
  }
  return Done{};
}

KeptUse KeptFiles::use() const {
  KeptUse use;
  std::set<std::int64_t> days;
  for (const KeptFile& file : list_) {
    ++use.items;
    use.bytes += file.bytes;
    days.insert(file.day());
  }
  use.days = static_cast<std::int64_t>(days.size());
  return use;
}

std::vector<KeptFile>::iterator KeptFiles::beginOfStaying() {
  switch (kind_) {
    case Kept::EccEvents:
      return list_.end();
    case Kept::SetAside:
      // The next run learns from a store set aside that its day is incomplete.
      return std::ranges::find_if(list_, [&](const KeptFile& file) {
        return file.day() >= today_ - 1 && !isAhead(file.day(), today_);
      });
    case Kept::Records:
      return std::ranges::find(list_, today_, &KeptFile::day);
    default:
      return list_.empty() ? list_.end() : list_.end() - 1;
  }
}

TrimmedFiles KeptFiles::trim(const Bounds& bounds) {
  for (const std::string& path : orphans_)
    fileSystem_.discard(path);
  TrimmedFiles trimmed;
  KeptUse left = use();
  const auto staying = beginOfStaying();
  // While a file that alone exceeds the bound is there, removing others does not help: it goes
  // before them or, when it stays or cannot be removed, does not count.
  std::int64_t stayingBytes = 0;
  for (const KeptFile& file : std::span(staying, list_.end()))
    stayingBytes += file.bytes;
  if (stayingBytes > bounds.bytes) left.bytes -= stayingBytes;
  std::stable_partition(list_.begin(), staying,
                        [&bounds](const KeptFile& file) { return file.bytes > bounds.bytes; });
  std::map<std::int64_t, std::size_t> filesOfDays;
  for (const KeptFile& file : list_)
    ++filesOfDays[file.day()];
  std::vector<std::string> companions;
  std::int64_t stuckBytes = 0;
  for (const KeptFile& file : std::span(list_.begin(), staying)) {
    if (left.days <= bounds.days && left.bytes <= bounds.bytes) break;
    // A log that the uploader has sent meanwhile is not lost.
    const bool isThere = FileSystem::status(file.path).has_value();
    if (Status removed = fileSystem_.remove(file.path); removed) {
      trimmed.removed += isThere ? 1 : 0;
      left.bytes -= file.bytes;
      if (--filesOfDays[file.day()] == 0) --left.days;
      if (!file.companion.empty()) companions.push_back(file.companion);
    } else {
      if (trimmed.status) trimmed.status = removed;
      if (file.bytes > bounds.bytes) {
        left.bytes -= file.bytes;
      } else if (stuckBytes += file.bytes; stuckBytes > bounds.bytes) {
        break;  // removing all others would not bring them within the bound
      }
    }
  }
  if (Status removed = removeCompanions(companions); trimmed.status) trimmed.status = removed;
  return trimmed;
}

// Logs before their metadata: while a log exists, even after a power cut, its metadata does too.
// Metadata that cannot be removed now is removed as an orphan later.
Status KeptFiles::removeCompanions(const std::vector<std::string>& companions) {
  if (companions.empty()) return Done{};
  if (Status flushed = fileSystem_.flushFolder(folder_); !flushed) return flushed;
  for (const std::string& companion : companions)
    fileSystem_.discard(companion);
  return Done{};
}

}  // namespace tavrel
