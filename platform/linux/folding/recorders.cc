#include "platform/linux/folding/recorders.h"

#include <algorithm>
#include <cerrno>
#include <charconv>
#include <iterator>
#include <optional>
#include <pwd.h>
#include <unistd.h>

#include "base/limits.h"
#include "base/text.h"
#include "client/segment_format.h"
#include "platform/linux/files/property_list_file.h"
#include "platform/linux/files/system_error.h"

namespace tavrel {
namespace {

constexpr std::string_view kSystemPrefix = "com.norvane.";

constexpr std::size_t kShownBytes = 60;          // of a user's name
constexpr std::size_t kLongestEntry = 1U << 20;  // of the table of users, in bytes

// Why it is unknown whether a user exists. Name services have other codes for "no".
constexpr int kObstacles[] = {EAGAIN, EINTR, EIO, EMFILE, ENFILE, ENOMEM, ERANGE};

// Nothing when there is no such user.
Expected<std::optional<std::uint32_t>> userNumber(std::string_view user) {
  std::uint32_t number = 0;
  const char* const end = user.data() + user.size();
  if (const auto [stop, error] = std::from_chars(user.data(), end, number);
      error == std::errc{} && stop == end) {
    return std::optional(number);
  }
  const std::string name(user);
  std::string text;
  passwd entry{};
  passwd* found = nullptr;
  int code = ERANGE;
  for (std::size_t size = 4096; code == ERANGE && size <= kLongestEntry; size *= 2) {
    text.resize(size);
    errno = 0;  // without a name service, getpwnam_r returns what it was before
    code = getpwnam_r(name.c_str(), &entry, text.data(), text.size(), &found);
  }
  if (std::ranges::find(kObstacles, code) != std::end(kObstacles)) {
    return systemError("look up the user", quotedText(user.substr(0, kShownBytes)), code);
  }
  return found == nullptr ? std::nullopt : std::optional<std::uint32_t>(found->pw_uid);
}

}  // namespace

Recorders Recorders::read(const DeviceRoot& root, FileSystem& files,
                          PropertyListCoding& propertyLists, SystemLog& log) {
  Recorders recorders;
  const std::string path = root.path(kRecordersFile);
  const auto status = FileSystem::status(path);
  const int code = errno;
  if (!status && (code == ENOENT || code == ENOTDIR)) {
    const std::string missing = reasonToMiss(path);
    recorders.areRightsKnown_ = missing.empty();
    if (!missing.empty()) log.log(LogLevel::Error, "%s: %s; repair or remove it", path, missing);
    return recorders;
  }
  const std::string reason = status ? reasonToDistrust(*status) : std::string();
  if (!reason.empty()) {
    log.log(LogLevel::Error, "%s is ignored: %s", path, reason);
    return recorders;
  }
  const auto bytes = status ? files.readIfPresent(path, limits::kPropertyListBytes)
                            : systemError("read", path, code);
  if (!bytes) {
    // It may list users: what would be refused without it has to wait.
    recorders.areRightsKnown_ = false;
    log.write(LogLevel::Error, bytes.error().message);
    return recorders;
  }
  if (!*bytes) return recorders;
  const plist::Dictionary content = dictionaryIn(**bytes, propertyLists, log, path);
  if (!content) return recorders;
  for (const plist::Entry& entry : content)
    recorders.add(entry.key.view(), entry.value, path, log);
  return recorders;
}

void Recorders::add(std::string_view user, const plist::Value& prefixes, const std::string& path,
                    SystemLog& log) {
  const auto complain = [&](std::string_view what, LogLevel level = LogLevel::Error) {
    log.log(level, "%s: the entry %s %s", path, quotedText(user.substr(0, kShownBytes)), what);
  };
  const plist::Array array = prefixes.array();
  if (!array) return complain("is ignored: give an array of prefixes");
  const bool areGood = std::all_of(array.begin(), array.end(), [](const plist::Value& prefix) {
    const auto text = prefix.string();
    return text && !text->empty() && text->size() <= kBHLongestName;
  });
  if (!areGood) return complain("is ignored: a prefix is a text of 1 to 1024 bytes");
  // Some users exist only while their service runs. In between, nobody may take their keys.
  const auto found = userNumber(user);
  const auto number = found ? *found : std::nullopt;
  if (number) {
    listed_.insert(*number);
  } else if (!found) {
    areRightsKnown_ = false;
    log.write(LogLevel::Error, path + ": " + found.error().message);
  } else {
    // A fold each hour must not fill the journal with it.
    complain("names no user of this machine: until it does, only root may record its keys",
             LogLevel::Info);
  }
  for (const plist::Value& prefix : array) {
    auto& users = users_[std::string(*prefix.string())];
    if (number) users.insert(*number);
  }
}

Recorders::Users::const_iterator Recorders::longestPrefixOf(std::string_view key) const {
  std::string_view rest = key;
  for (auto next = users_.upper_bound(rest); next != users_.begin();
       next = users_.upper_bound(rest)) {
    --next;
    const std::string_view below = next->first;
    if (rest.starts_with(below)) return next;
    // Any shorter prefix of the key is a prefix of what both have in common.
    const auto difference = std::mismatch(rest.begin(), rest.end(), below.begin(), below.end());
    rest = rest.substr(0, static_cast<std::size_t>(difference.first - rest.begin()));
  }
  return users_.end();
}

bool Recorders::mayRecord(std::uint32_t user, std::string_view key) const {
  if (user == 0) return true;
  const auto prefix = longestPrefixOf(key);
  const bool isSystems = key.starts_with(kSystemPrefix);
  if (prefix == users_.end()) return !isSystems && !listed_.contains(user);
  return prefix->second.contains(user) && (!isSystems || prefix->first.starts_with(kSystemPrefix));
}

}  // namespace tavrel
