#include "platform/linux/device/ecc_events.h"

#include <algorithm>
#include <array>
#include <cerrno>
#include <optional>
#include <utility>

#include "base/bytes.h"
#include "base/format.h"
#include "base/limits.h"
#include "base/parse_number.h"
#include "base/uuid.h"
#include "platform/linux/files/boot_id.h"
#include "platform/linux/files/property_list_file.h"

namespace tavrel {
namespace {

constexpr std::string_view kCounters = "/var/lib/tavrel/edac-counters.plist";
constexpr std::string_view kControllers = "/sys/devices/system/edac/mc";
constexpr std::string_view kEventEnding = ".event";
constexpr std::string_view kErrorEnding = ".errno";
constexpr mode_t kMode = 0640;

/// Stored with the counters: the ID of their boot, and its number among the boots seen so far.
constexpr std::string_view kBootIDKey = "BootID";
constexpr std::string_view kBootNumberKey = "BootNumber";

/// The kernel's largest error number.
constexpr std::uint64_t kLargestErrorNumber = 4095;

struct CountedError {
  std::uint8_t eventID;
  std::string_view file;
};
constexpr CountedError kCountedErrors[] = {{1, "ce_count"}, {2, "ue_count"}};

std::string_view withoutLineEnd(std::string_view text) {
  return text.substr(0, text.size() - (text.ends_with('\n') ? 1 : 0));
}

/// A decimal number, with or without a line end.
std::optional<std::uint64_t> numberIn(std::string_view text) {
  return parseNumber<std::uint64_t>(withoutLineEnd(text));
}

/// 0 when the text is not an error number.
int errorNumberIn(std::string_view text) {
  const std::uint64_t number = numberIn(text).value_or(0);
  return number <= kLargestErrorNumber ? static_cast<int>(number) : 0;
}

std::string eventOf(std::uint8_t identifier, std::initializer_list<std::uint64_t> registers) {
  std::array<std::byte, kEccEventBytes> event{};
  event[0] = std::byte{identifier};
  event[1] = static_cast<std::byte>(registers.size());
  std::uint64_t offset = 8;
  for (const std::uint64_t value : registers) {
    storeLittle64(event, offset, value);
    offset += sizeof(value);
  }
  return std::string(asText(event));
}

SystemControls::Result give(std::string_view event, MutableByteSpan buffer) {
  const ByteSpan bytes = asBytes(event);
  if (bytes.size() > buffer.size()) return {ENOMEM, 0};
  std::copy(bytes.begin(), bytes.end(), buffer.begin());
  return {0, bytes.size()};
}

}  // namespace

SystemControls::Result EccEvents::next(MutableByteSpan buffer) {
  if (buffer.size() < kEccEventBytes) return {ENOMEM, 0};
  if (!unfiled_.empty() || handedOut_ == kEccEventsOfARun) return endRun(EBUSY);
  if (queue_.empty() && !fill()) return endRun(EBUSY);
  if (mode_ == Mode::Consume && !queue_.empty() && !lockQueue()) return endRun(EBUSY);
  while (!queue_.empty()) {
    const Event event = std::move(queue_.back());
    queue_.pop_back();
    if (!event.bytes.empty()) {
      ++handedOut_;
      return give(event.bytes, buffer);
    }
    const std::string path = root_.path(kEccEventFolder) + '/' + event.name;
    const auto content = files_.readIfPresent(path, limits::kSystemFactBytes);
    if (content && !*content) continue;  // another process took it
    const bool isEvent = path.ends_with(kEventEnding);
    const int error = content && !isEvent ? errorNumberIn(**content) : 0;
    const bool isUsable = content && (isEvent ? (*content)->size() == kEccEventBytes : error != 0);
    if (!isUsable) {
      setAside(path, content ? "it is neither an event of 72 bytes nor an error number"
                             : content.error().message);
      continue;
    }
    if (mode_ == Mode::Consume) unfiled_ = path;
    if (error != 0) {
      filed();
      return endRun(error);
    }
    ++handedOut_;
    return give(**content, buffer);
  }
  return endRun(ENOENT);
}

// An event that cannot be removed counts as not filed, so that this run does not see it again.
void EccEvents::filed() {
  if (unfiled_.empty()) return;
  if (Status removed = files_.remove(unfiled_); !removed) {
    return log_.write(LogLevel::Error, removed.error().message);
  }
  unfiled_.clear();
}

SystemControls::Result EccEvents::endRun(int errorNumber) {
  handedOut_ = 0;
  unfiled_.clear();
  folderLock_.reset();
  if (mode_ == Mode::Consume) queue_.clear();
  return {errorNumber, 0};
}

void EccEvents::setAside(const std::string& path, std::string_view fault) {
  std::string outcome = "it would be set aside";
  if (mode_ == Mode::Consume) {
    const Status moved = files_.rename(path, path + ".unusable");
    outcome = moved ? "it is set aside" : moved.error().message;
  }
  log_.log(LogLevel::Error, "%s: %s; %s", path, fault, outcome);
}

bool EccEvents::lockQueue() {
  if (folderLock_) return true;
  auto lock = files_.lockFolder(root_.path(kEccEventFolder));
  if (!lock) {
    log_.write(LogLevel::Error, lock.error().message);
    return false;
  }
  folderLock_ = *std::move(lock);
  return true;
}

bool EccEvents::fill() {
  const bool isPeek = mode_ == Mode::Peek;
  if (std::exchange(hasLooked_, true) && isPeek) return true;
  if (isPeek) {
    plist::Dictionary counted = seenErrors();
    queue_ = newErrors(counted);
  } else if (!publishCountedErrors()) {
    return false;
  }
  const auto names = files_.list(root_.path(kEccEventFolder));
  if (!names) {
    log_.write(LogLevel::Error, names.error().message);
    return true;
  }
  for (const std::string& name : *names) {
    if (name.ends_with(kEventEnding) || name.ends_with(kErrorEnding)) queue_.push_back({name, {}});
  }
  std::stable_sort(queue_.begin(), queue_.end(),
                   [](const Event& a, const Event& b) { return a.name > b.name; });
  // An event published again has the same name as in the run that was cut off.
  const auto isSame = [](const Event& a, const Event& b) { return a.name == b.name; };
  queue_.erase(std::unique(queue_.begin(), queue_.end(), isSame), queue_.end());
  return true;
}

plist::Dictionary EccEvents::seenErrors() {
  const auto seen = readDictionaryFile(files_, propertyLists_, log_, root_.path(kCounters));
  return seen ? seen : plist::Dictionary::create();
}

bool EccEvents::publishCountedErrors() {
  plist::Dictionary counted = seenErrors();
  const plist::Value before = mutableCopy(counted);
  const std::vector<Event> events = newErrors(counted);
  if (before == plist::Value(counted)) return true;
  if (!folderLock_) {
    // Another process may publish the same errors until the folder is locked.
    if (Status made = files_.makeFolders(root_.path(kEccEventFolder)); !made) {
      log_.write(LogLevel::Error, made.error().message);
      return true;
    }
    return lockQueue() && publishCountedErrors();
  }
  const Status published = publish(events, counted);
  if (published) return true;
  log_.write(LogLevel::Error, published.error().message);
  // Without stored counts, the next look would publish these errors again. The counts may be in
  // place although they could not be flushed.
  if (before != plist::Value(seenErrors())) return true;
  for (const Event& event : events)
    files_.discard(root_.path(kEccEventFolder) + '/' + event.name);
  return true;
}

// Events first: a run that is cut off in between publishes them twice instead of never.
Status EccEvents::publish(const std::vector<Event>& events, const plist::Dictionary& counted) {
  for (const Event& event : events) {
    const std::string path = root_.path(kEccEventFolder) + '/' + event.name;
    if (Status written = files_.replace(path, asBytes(event.bytes), kMode); !written) {
      return written;
    }
  }
  const auto bytes = propertyLists_.encodeXml(counted);
  if (!bytes) return bytes.error();
  return files_.replace(root_.path(kCounters), asBytes(*bytes), kMode);
}

std::vector<EccEvents::Event> EccEvents::newErrors(plist::Dictionary& counted) {
  std::vector<Event> events;
  const std::string folder = root_.pathOrMachine(kControllers);
  const auto controllers = files_.list(folder);
  if (!controllers) return events;
  const std::string bootID = bootIDBeside(folder);
  const auto lastBoot = counted.number(kBootNumberKey);
  std::uint64_t boot = lastBoot ? static_cast<std::uint64_t>(lastBoot->int64()) : 0;
  if (!bootID.empty() && counted.string(kBootIDKey) != bootID) {
    ++boot;
    // Counts without a boot ID, from an earlier version, are taken to be of this boot.
    if (counted.contains(kBootIDKey)) counted = {{kBootNumberKey, boot}};
  }
  // The number orders boots; the ID distinguishes boots whose counts were never stored.
  const std::string prefix = bootID.empty() ? "" : format("%010llu-%s-", boot, bootID.substr(0, 8));
  for (const std::string& controller : *controllers) {
    const auto number =
        controller.starts_with("mc") ? numberIn(controller.substr(2)) : std::nullopt;
    if (!number) continue;
    for (const CountedError& kind : kCountedErrors) {
      const std::string file = controller + '/' + std::string(kind.file);
      const auto content = files_.readIfPresent(folder + '/' + file, limits::kSystemFactBytes);
      const auto count = content && *content ? numberIn(**content) : std::nullopt;
      if (!count) continue;
      const auto before = counted.number(file);
      counted.set(file, *count);
      // A counter that has gone back has restarted. On the first look, errors counted so far are
      // new.
      const std::uint64_t last = before ? static_cast<std::uint64_t>(before->int64()) : 0;
      const std::uint64_t fresh = *count >= last ? *count - last : *count;
      if (fresh == 0) continue;
      events.push_back(
          {format("edac-%s-%s-%s%020llu%s", controller, kind.file, prefix, *count, kEventEnding),
           eventOf(kind.eventID, {*number, fresh, *count})});
    }
  }
  if (!bootID.empty() && !counted.empty()) {
    counted.set(kBootIDKey, bootID);
    counted.set(kBootNumberKey, boot);
  }
  return events;
}

std::string EccEvents::bootIDBeside(const std::string& controllers) {
  const bool isOfRoot = controllers == root_.path(kControllers);
  const std::string path = isOfRoot ? root_.path(kBootIDFile) : std::string(kBootIDFile);
  const auto content = files_.readIfPresent(path, limits::kSystemFactBytes);
  if (!content || !*content) return {};
  return normalisedUuid(withoutLineEnd(**content)).value_or("");
}

}  // namespace tavrel
