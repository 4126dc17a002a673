#include "platform/linux/runs/upload_state.h"

#include <algorithm>
#include <utility>

#include "platform/linux/files/property_list_file.h"

namespace tavrel {
namespace {

constexpr mode_t kMode = 0600;

constexpr std::pair<const char*, std::optional<plist::Date> UploadState::*> kDates[] = {
    {"LastAttempt", &UploadState::lastAttempt},
    {"LastSuccess", &UploadState::lastSuccess},
    {"LastFailure", &UploadState::lastFailure},
    {"NextAttempt", &UploadState::nextAttempt}};
constexpr std::pair<const char*, std::int64_t UploadState::*> kCounts[] = {
    {"FailedAttempts", &UploadState::failedAttempts},
    {"FailedTransfers", &UploadState::failedTransfers},
    {"Sent", &UploadState::sent},
    {"Refused", &UploadState::refused}};
constexpr const char* kFailureKey = "Failure";

}  // namespace

UploadState uploadStateOf(const plist::Dictionary& stored) {
  UploadState state;
  for (const auto& [key, member] : kDates)
    state.*member = stored.date(key);
  for (const auto& [key, member] : kCounts) {
    // Leaves room for what a run adds.
    constexpr std::int64_t kMost = std::int64_t{1} << 62;
    const auto number = stored.number(key);
    state.*member = number ? std::clamp<std::int64_t>(number->int64(), 0, kMost) : 0;
  }
  state.failure = stored.string(kFailureKey).value_or("");
  return state;
}

UploadState readUploadState(FileSystem& files, PropertyListCoding& propertyLists, SystemLog& log,
                            const std::string& path) {
  return uploadStateOf(readDictionaryFile(files, propertyLists, log, path));
}

Status writeUploadState(FileSystem& files, PropertyListCoding& propertyLists,
                        const std::string& path, const UploadState& state) {
  plist::Dictionary stored = plist::Dictionary::create();
  for (const auto& [key, member] : kDates)
    if (state.*member) stored.set(key, *(state.*member));
  for (const auto& [key, member] : kCounts)
    stored.set(key, state.*member);
  if (!state.failure.empty()) stored.set(kFailureKey, state.failure);
  const auto bytes = propertyLists.encodeXml(stored);
  if (!bytes) return bytes.error();
  return files.replace(path, asBytes(*bytes), kMode);
}

}  // namespace tavrel
