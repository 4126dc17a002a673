#include "platform/linux/folding/fold_notes.h"

#include <cerrno>
#include <sys/stat.h>
#include <unistd.h>

#include "base/bytes.h"
#include "base/limits.h"
#include "platform/linux/files/digests.h"
#include "platform/linux/files/system_error.h"

namespace tavrel {
namespace {

constexpr std::string_view kLockPath = "/run/tavrel/fold.lock";

// A fold of many values on slow flash takes minutes. Without it, the daily run would report too
// little.
constexpr LockPatience kPatience{600'000, "it is folding: try again later"};

// The number of remembered lines. Those beyond `limits::kFoldRefusalLines` are remembered only to
// be counted once; lines beyond this number are counted in each fold.
constexpr std::size_t kRemembered = 8192;

// The two counts in front of the remembered lines.
constexpr std::size_t kHeaderBytes = 16;

}  // namespace

Expected<FoldNotes> FoldNotes::lock(const DeviceRoot& root, FileSystem& files, SystemLog& log) {
  std::string path = root.path(kLockPath);
  Expected<Descriptor> file = files.lockFile(path, kPatience);
  if (!file) return file.error();
  return FoldNotes(*std::move(file), std::move(path), log);
}

FoldNotes::FoldNotes(Descriptor file, std::string path, SystemLog& log)
    : file_(std::move(file)), path_(std::move(path)), log_(log) {
  std::string content(kHeaderBytes + kRemembered * sizeof(std::uint64_t), '\0');
  const ssize_t size = pread(file_.get(), content.data(), content.size(), 0);
  content.resize(size > 0 ? static_cast<std::size_t>(size) : 0);
  uncountedFiles_ = loadLittle64(asBytes(content), 0).value_or(0);
  uncountedValues_ = loadLittle64(asBytes(content), 8).value_or(0);
  for (std::size_t at = kHeaderBytes; at + 8 <= content.size(); at += 8)
    logged_.insert(*loadLittle64(asBytes(content), at));
}

bool FoldNotes::logOnce(std::string_view line) {
  const std::uint64_t digest = *loadLittle64(sha256(asBytes(line)), 0);
  if (logged_.contains(digest)) return false;
  if (logged_.size() >= kRemembered) return true;
  logged_.insert(digest);
  hasChanged_ = true;
  if (logged_.size() <= limits::kFoldRefusalLines) {
    log_.write(LogLevel::Error, line);
  } else {
    ++leftOut_;
  }
  return true;
}

void FoldNotes::refuse(std::string_view line) {
  if (!logOnce(line)) return;
  ++uncountedFiles_;
  hasChanged_ = true;
}

void FoldNotes::addUncountedValues(std::uint64_t count) {
  uncountedValues_ += count;
  hasChanged_ = hasChanged_ || count > 0;
}

void FoldNotes::clearUncounted() {
  hasChanged_ = hasChanged_ || uncountedFiles_ > 0 || uncountedValues_ > 0;
  uncountedFiles_ = uncountedValues_ = 0;
}

void FoldNotes::mark() {
  // The kernel's own timestamps are too coarse to distinguish two marks.
  timespec times[2]{};
  clock_gettime(CLOCK_REALTIME, &times[0]);
  times[1] = times[0];
  futimens(file_.get(), times);
}

timespec FoldNotes::lastMark(const DeviceRoot& root) {
  const auto status = FileSystem::status(root.path(kLockPath));
  return status ? status->st_mtim : timespec{};
}

void FoldNotes::save() {
  if (leftOut_ > 0) {
    log_.log(LogLevel::Error, "%llu more refusals of this fold are not listed", leftOut_);
  }
  if (!hasChanged_) return;
  std::string content;
  const auto append = [&](std::uint64_t word) {
    std::array<std::byte, 8> bytes;
    storeLittle64(bytes, 0, word);
    content += asText(bytes);
  };
  append(uncountedFiles_);
  append(uncountedValues_);
  for (const std::uint64_t digest : logged_)
    append(digest);
  const ssize_t written = pwrite(file_.get(), content.data(), content.size(), 0);
  if (written == std::ssize(content)) return;
  const Error why = systemError("write", path_, written < 0 ? errno : ENOSPC);
  log_.log(LogLevel::Error, "%s: refusals may be logged and counted again", why.message);
}

}  // namespace tavrel
