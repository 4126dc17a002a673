#include "upload/outbox.h"

#include <algorithm>
#include <fcntl.h>
#include <sys/stat.h>
#include <unistd.h>

#include "base/limits.h"
#include "platform/linux/files/descriptor.h"

namespace tavrel::upload {
namespace {

std::vector<WaitingLog> oldestFirst(const LogFolder& folder, const LogFolder::Listing& listing) {
  std::vector<WaitingLog> logs;
  for (const std::string& name : listing.logs)
    logs.push_back({folder.timeOf(name), name});
  std::ranges::sort(logs);
  return logs;
}

constexpr mode_t kClosed = 0700;
constexpr mode_t kOpen = 0755;

void openIfClosed(const std::string& folder) {
  const Descriptor descriptor(
      ::open(folder.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  struct stat found {};
  if (descriptor && fstat(descriptor.get(), &found) == 0 && found.st_uid == geteuid() &&
      (found.st_mode & ALLPERMS) == kClosed) {
    fchmod(descriptor.get(), kOpen);
  }
}

}  // namespace

Outbox::Outbox(const DeviceRoot& root, FileSystem& files)
    : folder_(root.path(kSubmissionFolder)),
      files_(files),
      pending_(folder_, kPendingFolder, files),
      outbox_(folder_, kOutboxFolder, files),
      refused_(folder_, kRefusedFolder, files) {}

void Outbox::openFolders() const {
  openIfClosed(outbox_.path());
  openIfClosed(refused_.path());
}

Expected<std::vector<WaitingLog>> Outbox::logs() {
  auto listing = outbox_.list();
  if (!listing) return listing.error();
  if (!listing->orphans.empty()) {
    const auto lock = files_.lockFolder(folder_);
    if (!lock) return lock.error();
    listing = outbox_.list();
    if (!listing) return listing.error();
    outbox_.removeOrphans(*listing);
  }
  return oldestFirst(outbox_, *listing);
}

Status Outbox::remove(const std::string& name) {
  return outbox_.removeLog(name);
}

RemovedLogs Outbox::removeAll() {
  if (!FileSystem::status(folder_)) return {};
  const auto lock = files_.lockFolder(folder_);
  if (!lock) return {0, lock.error()};
  return removeLogsIn(files_, folder_, {kPendingFolder, kOutboxFolder});
}

Status Outbox::takePending(const std::function<bool()>& mayMove) {
  const auto listing = pending_.list();
  if (!listing) return listing.error();
  Status outcome = Done{};
  for (const WaitingLog& log : oldestFirst(pending_, *listing)) {
    const auto lock = files_.lockFolder(folder_);
    if (!lock) return lock.error();
    if (!mayMove()) return outcome;
    if (Status moved = pending_.moveLog(log.name, outbox_); !moved && outcome) outcome = moved;
  }
  return outcome;
}

Status Outbox::refuse(const std::string& name, std::int64_t today) {
  const auto lock = files_.lockFolder(folder_);
  if (!lock) return lock.error();
  if (Status moved = outbox_.moveLog(name, refused_); !moved) return moved;
  return refused_.keepNewest(limits::kRefusedLogs, limits::kRefusedBytes, name, today);
}

}  // namespace tavrel::upload
