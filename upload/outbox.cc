#include "upload/outbox.h"

#include <algorithm>

#include "base/limits.h"

namespace tavrel::upload {
namespace {

std::vector<WaitingLog> oldestFirst(const LogFolder& folder, const LogFolder::Listing& listing) {
  std::vector<WaitingLog> logs;
  for (const std::string& name : listing.logs)
    logs.push_back({folder.timeOf(name), name});
  std::ranges::sort(logs);
  return logs;
}

}  // namespace

Outbox::Outbox(const DeviceRoot& root, FileSystem& files)
    : folder_(root.path(kSubmissionFolder)),
      files_(files),
      pending_(folder_, kPendingFolder, files),
      outbox_(folder_, kOutboxFolder, files),
      refused_(folder_, kRefusedFolder, files) {}

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
