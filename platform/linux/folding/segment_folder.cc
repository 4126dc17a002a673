#include "platform/linux/folding/segment_folder.h"

#include <algorithm>
#include <cerrno>
#include <compare>
#include <cstdio>
#include <fcntl.h>
#include <linux/magic.h>
#include <span>
#include <sys/vfs.h>
#include <unistd.h>

#include "base/limits.h"
#include "base/system_text.h"
#include "base/text.h"
#include "platform/linux/files/folder_walk.h"
#include "platform/linux/files/random.h"
#include "platform/linux/files/system_error.h"

namespace tavrel {
namespace {

constexpr const char* kRequest = "fold-wanted";
constexpr std::string_view kSegmentEnding = ".segment";

// Whether opening a file failed for a reason other than the file itself.
bool isSystemsFailure(int code) {
  return code == EMFILE || code == ENFILE || code == ENOMEM || code == EIO;
}

// For a file that could not be opened or examined.
std::string_view adviceFor(int code) {
  return code == EACCES || code == EPERM ? "let the user that folds read it"
                                         : "the next fold tries again";
}

// Why a file cannot be a segment, judged by its status; null when it can.
const char* faultOf(const struct stat& status, dev_t device) {
  if (S_ISLNK(status.st_mode)) return "a symbolic link";
  if (!S_ISREG(status.st_mode)) return "not a regular file";
  if (status.st_nlink != 1) return "a file with several names";
  if (status.st_dev != device) return "on another file system";
  return nullptr;
}

// A segment, ordered by how long it has waited: a fold that reads one puts it behind the others.
struct Waiting {
  std::int64_t seconds;
  std::int64_t nanoseconds;
  std::string name;
  auto operator<=>(const Waiting&) const = default;
};

// The segments of one user that have waited longest, at most `limits::kSegmentsPerUser`.
class LongestWaiting {
 public:
  void offer(Waiting segment) {
    ++offered_;
    heap_.push_back(std::move(segment));
    std::push_heap(heap_.begin(), heap_.end());
    if (heap_.size() > limits::kSegmentsPerUser) {
      std::pop_heap(heap_.begin(), heap_.end());
      heap_.pop_back();
    }
  }
  std::uint64_t offered() const { return offered_; }
  std::size_t size() const { return heap_.size(); }
  // In order. Ends the choice.
  std::vector<Waiting>& sorted() {
    std::sort_heap(heap_.begin(), heap_.end());
    return heap_;
  }

 private:
  std::uint64_t offered_ = 0;
  std::vector<Waiting> heap_;
};

// Adds to the listing, of each user, those that have waited longest. Users with few segments get
// all of them read; the others share what is left of the total.
void choose(std::map<std::uint32_t, LongestWaiting>& byOwner, SegmentFolder::Listing& listing) {
  std::vector<std::pair<std::size_t, std::uint32_t>> owners;
  for (const auto& [owner, segments] : byOwner)
    owners.emplace_back(segments.size(), owner);
  std::sort(owners.begin(), owners.end());
  std::size_t left = limits::kSegments;
  for (std::size_t i = 0; i < owners.size(); ++i) {
    const auto [size, owner] = owners[i];
    const std::size_t count = std::min(size, left / (owners.size() - i));
    left -= count;
    LongestWaiting& segments = byOwner[owner];
    if (segments.offered() > count) listing.leftOut[owner] = segments.offered() - count;
    for (Waiting& segment : std::span(segments.sorted()).first(count))
      listing.segments.push_back({std::move(segment.name), owner});
  }
}

}  // namespace

Expected<std::optional<SegmentFolder>> SegmentFolder::open(const DeviceRoot& root) {
  std::string path = root.path(kSegmentFolder);
  Descriptor folder(::open(path.c_str(), O_RDONLY | O_DIRECTORY | O_NOFOLLOW | O_CLOEXEC));
  if (!folder) {
    if (errno == ENOENT) return std::optional<SegmentFolder>();
    return systemError("open", path);
  }
  struct statfs fileSystem {};
  struct stat status {};
  if (fstatfs(folder.get(), &fileSystem) != 0 || fstat(folder.get(), &status) != 0) {
    return systemError("examine", path);
  }
  if (fileSystem.f_type != TMPFS_MAGIC)
    return Error{path + " is not on a tmpfs: nothing is folded; mount a tmpfs there"};
  return std::optional(SegmentFolder(std::move(path), std::move(folder), status.st_dev));
}

bool SegmentFolder::isOutOfReach(const DeviceRoot& root) {
  const std::string path = root.path(kSegmentFolder);
  struct statfs fileSystem {};
  if (access(path.c_str(), R_OK) != 0) return errno == EACCES;
  return statfs(path.c_str(), &fileSystem) == 0 && fileSystem.f_type != TMPFS_MAGIC;
}

Expected<SegmentFolder::Listing> SegmentFolder::list(std::size_t mostFiles) const {
  Listing listing;
  const auto refuse = [&](std::string_view name, std::string_view reason) {
    if (listing.refusals.size() < limits::kListedRefusals) {
      listing.refusals.push_back(refusal(name, reason));
    }
  };
  std::map<std::uint32_t, LongestWaiting> byOwner;
  std::size_t entries = 0;
  const int code = walkFolder(folder_, [&](const dirent& entry) {
    const std::string_view name = entry.d_name;
    if (name == kRequest) return true;
    if (++entries > mostFiles) {
      // At the front, because only the first lines are logged.
      listing.refusals.insert(listing.refusals.begin(),
                              path_ + " has more than " + std::to_string(mostFiles) +
                                  " files: the rest is not folded; remove files that are not "
                                  "segments");
      listing.isWhole = false;
      return false;
    }
    if (!name.ends_with(kSegmentEnding)) {
      refuse(name, "not the name of a segment");
      return true;
    }
    struct stat status {};
    if (fstatat(folder_.get(), entry.d_name, &status, AT_SYMLINK_NOFOLLOW) != 0) {
      if (errno != ENOENT) listing.isWhole = false;
      return true;
    }
    if (const char* const fault = faultOf(status, device_)) {
      refuse(name, fault);
      if (S_ISREG(status.st_mode)) listing.linked.insert(status.st_uid);
      return true;
    }
    byOwner[status.st_uid].offer(
        {status.st_mtim.tv_sec, status.st_mtim.tv_nsec, std::string(name)});
    return true;
  });
  // What is not seen would pass for gone.
  if (code != 0) return systemError("list", path_, code);
  choose(byOwner, listing);
  std::sort(listing.segments.begin(), listing.segments.end(),
            [](const SegmentEntry& a, const SegmentEntry& b) { return a.name < b.name; });
  return listing;
}

Expected<SegmentOpening> SegmentFolder::openSegment(const SegmentEntry& entry) const {
  const auto refuse = [&](std::string_view reason, std::string_view advice = kRemoveIt) {
    return SegmentOpening{std::nullopt, refusal(entry.name, reason, advice)};
  };
  OpenSegment segment{entry,
                      Descriptor(openat(folder_.get(), entry.name.c_str(),
                                        O_RDONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC)),
                      0, 0};
  if (!segment.file) {
    if (errno == ENOENT) return SegmentOpening();
    if (isSystemsFailure(errno)) return systemError("open", path_ + "/" + entry.name);
    if (errno == ELOOP) return refuse("a symbolic link");
    return refuse(systemText(errno), adviceFor(errno));
  }
  struct stat status {};
  if (fstat(segment.file.get(), &status) != 0) {
    return refuse("it cannot be examined: " + systemText(errno), adviceFor(errno));
  }
  // The segment was removed after it was listed.
  if (status.st_nlink == 0) return SegmentOpening();
  if (const char* const fault = faultOf(status, device_)) return refuse(fault);
  segment.entry.owner = status.st_uid;
  segment.device = status.st_dev;
  segment.inode = status.st_ino;
  return SegmentOpening{std::move(segment), {}};
}

Descriptor SegmentFolder::openToAcknowledge(const OpenSegment& segment) const {
  Descriptor file(openat(folder_.get(), segment.entry.name.c_str(),
                         O_WRONLY | O_NOFOLLOW | O_NONBLOCK | O_CLOEXEC));
  struct stat status {};
  if (!file || fstat(file.get(), &status) != 0 || status.st_dev != segment.device ||
      status.st_ino != segment.inode) {
    return {};
  }
  return file;
}

void SegmentFolder::putBehindOthers(const SegmentEntry& entry) const {
  utimensat(folder_.get(), entry.name.c_str(), nullptr, AT_SYMLINK_NOFOLLOW);
}

bool SegmentFolder::remove(const OpenSegment& segment) const {
  struct stat status {};
  const char* const name = segment.entry.name.c_str();
  return fstatat(folder_.get(), name, &status, AT_SYMLINK_NOFOLLOW) == 0 &&
         status.st_dev == segment.device && status.st_ino == segment.inode &&
         unlinkat(folder_.get(), name, 0) == 0;
}

std::string SegmentFolder::refusal(std::string_view name, std::string_view reason,
                                   std::string_view advice) const {
  std::string line;
  appendQuoted(line, name.substr(0, 80));
  return line.append(" in ")
      .append(path_)
      .append(" is refused: ")
      .append(reason)
      .append("; ")
      .append(advice);
}

Status SegmentFolder::clearRequest() const {
  if (unlinkat(folder_.get(), kRequest, 0) == 0 || errno == ENOENT) return Done{};
  // Anybody can make a folder of that name. A folder that is not empty is renamed, and then refused
  // as other files are: as a request it would trigger one fold after another for ever.
  const int code = errno;
  if (unlinkat(folder_.get(), kRequest, AT_REMOVEDIR) == 0) return Done{};
  const std::string aside = std::string(kRequest) + "-" + randomName();
  if (renameat(folder_.get(), kRequest, folder_.get(), aside.c_str()) == 0) return Done{};
  return systemError("remove", path_ + "/" + kRequest, code);
}

}  // namespace tavrel
