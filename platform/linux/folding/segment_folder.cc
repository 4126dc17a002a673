#include "platform/linux/folding/segment_folder.h"

#include <algorithm>
#include <cerrno>
#include <cstdio>
#include <fcntl.h>
#include <linux/magic.h>
#include <random>
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

/// A random choice of at most `most` of the elements offered.
template <class Element>
class Sample {
 public:
  explicit Sample(std::size_t most) : most_(most) {}

  template <class Random>
  void offer(Element element, Random& random) {
    ++offered_;
    if (chosen_.size() < most_) return chosen_.push_back(std::move(element));
    const std::uint64_t place = random() % offered_;
    if (place < most_) chosen_[static_cast<std::size_t>(place)] = std::move(element);
  }
  std::vector<Element>& chosen() { return chosen_; }
  std::uint64_t offered() const { return offered_; }

 private:
  std::size_t most_;
  std::uint64_t offered_ = 0;
  std::vector<Element> chosen_;
};

using NamesByOwner = std::map<std::uint32_t, Sample<std::string>>;

// Draws the segments of a listing, and counts those of each owner that are left out.
void choose(NamesByOwner& byOwner, std::minstd_rand& random, SegmentFolder::Listing& listing) {
  Sample<SegmentEntry> all(limits::kSegments);
  for (auto& [owner, names] : byOwner) {
    for (std::string& name : names.chosen())
      all.offer({std::move(name), owner}, random);
  }
  listing.segments = std::move(all.chosen());
  std::map<std::uint32_t, std::uint64_t> chosen;
  for (const SegmentEntry& entry : listing.segments)
    ++chosen[entry.owner];
  for (const auto& [owner, names] : byOwner) {
    const std::uint64_t leftOut = names.offered() - chosen[owner];
    if (leftOut > 0) listing.leftOut[owner] = leftOut;
  }
  std::sort(listing.segments.begin(), listing.segments.end(),
            [](const SegmentEntry& a, const SegmentEntry& b) { return a.name < b.name; });
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
  std::minstd_rand random(std::random_device{}());
  NamesByOwner byOwner;
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
    byOwner.try_emplace(status.st_uid, limits::kSegmentsPerUser)
        .first->second.offer(std::string(name), random);
    return true;
  });
  // What is not seen would pass for gone.
  if (code != 0) return systemError("list", path_, code);
  choose(byOwner, random, listing);
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

bool SegmentFolder::remove(const OpenSegment& segment) const {
  struct stat status {};
  const char* const name = segment.entry.name.c_str();
  return fstatat(folder_.get(), name, &status, AT_SYMLINK_NOFOLLOW) == 0 &&
         status.st_dev == segment.device && status.st_ino == segment.inode &&
         unlinkat(folder_.get(), name, 0) == 0;
}

std::string SegmentFolder::refusal(std::string_view name, std::string_view reason,
                                   std::string_view advice) const {
  return quotedText(name.substr(0, 80))
      .append(" in ")
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
