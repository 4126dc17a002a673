#include "tools/device/tasking_document.h"

#include <algorithm>
#include <cstddef>
#include <initializer_list>
#include <optional>
#include <set>
#include <string_view>
#include <utility>

#include "platform/linux/logs/submission_permission.h"
#include "platform/linux/preferences/file_preferences.h"
#include "platform/persisted_state.h"
#include "tools/console/typed_value.h"
#include "tools/console/value_text.h"
#include "tools/device/known_preferences.h"

namespace tavrel {
namespace {

class Findings {
 public:
  void add(std::string_view path, std::string_view message) {
    lines_.push_back(std::string(path) + ": " + std::string(message));
  }

  /// The text under `key`; nothing, after adding a finding, when there is none.
  std::optional<std::string_view> requireText(const plist::Dictionary& dictionary,
                                              std::string_view key, std::string_view path) {
    const plist::Value value = dictionary.get(key);
    const auto text = dictionary.string(key);
    if (!value) {
      add(path, "is missing");
    } else if (!text) {
      add(path, "must be a string, not " + kindWithArticle(value));
    } else if (text->empty()) {
      add(path, "must not be empty");
    } else {
      return text;
    }
    return std::nullopt;
  }

  void refuseOtherKeys(const plist::Dictionary& dictionary, std::string_view path,
                       std::initializer_list<std::string_view> known) {
    for (const plist::Entry& entry : dictionary) {
      const std::string_view key = entry.key.view();
      if (std::find(known.begin(), known.end(), key) != known.end()) continue;
      std::string message = "is not a known key; the known ones are";
      for (const std::string_view name : known) {
        message += name == *known.begin() ? " " : ", ";
        message += name;
      }
      add(std::string(path) + std::string(key), message);
    }
  }

  /// Preferences are stored as XML, which cannot hold every text.
  void refuseOtherTexts(const plist::Value& value, std::string_view path) {
    if (hasXmlTextsOnly(value)) return;
    add(path,
        "contains text that preferences cannot store: property lists contain no control characters "
        "and only "
        "UTF-8: give such bytes as data");
  }

  std::vector<std::string> take() { return std::move(lines_); }

 private:
  std::vector<std::string> lines_;
};

}  // namespace

std::vector<std::string> checkTasking(const plist::Value& tasking) {
  Findings findings;
  const plist::Dictionary dictionary = tasking.dictionary();
  if (!dictionary) {
    findings.add("tasking", "must be a dictionary, not " + kindWithArticle(tasking));
    return findings.take();
  }
  findings.refuseOtherKeys(dictionary, "", {kTaskingIDKey, kTaskingDigestKey, kTaskingPayloadKey});
  findings.requireText(dictionary, kTaskingIDKey, kTaskingIDKey);
  findings.refuseOtherTexts(dictionary.get(kTaskingIDKey), kTaskingIDKey);
  findings.refuseOtherTexts(dictionary.get(kTaskingDigestKey), kTaskingDigestKey);
  const plist::Value payload = dictionary.get(kTaskingPayloadKey);
  if (payload && !payload.array()) {
    findings.add(kTaskingPayloadKey, "must be an array, not " + kindWithArticle(payload));
  }

  std::set<std::pair<std::string_view, std::string_view>> settings;
  std::size_t index = 0;
  const plist::Array array = payload.array();
  for (const plist::Value& element : array) {
    const std::string path = std::string(kTaskingPayloadKey) + "[" + std::to_string(index++) + "]";
    findings.refuseOtherTexts(element, path);
    const plist::Dictionary setting = element.dictionary();
    if (!setting) {
      findings.add(path, "must be a dictionary, not " + kindWithArticle(element));
      continue;
    }
    const auto pathOf = [&](std::string_view key) { return path + "/" + std::string(key); };
    findings.refuseOtherKeys(setting, path + "/", {kSettingDomain, kSettingKey, kSettingValue});
    const auto domain = findings.requireText(setting, kSettingDomain, pathOf(kSettingDomain));
    const auto key = findings.requireText(setting, kSettingKey, pathOf(kSettingKey));
    if (domain && !FilePreferences::isValidDomain(*domain)) {
      findings.add(pathOf(kSettingDomain), "is not the name of a preference domain");
    }
    if (domain && key && isOfPermission(*domain, *key)) {
      findings.add(path,
                   "changes the permission to submit logs, which only the owner may: use "
                   "'tavrelctl allow' or 'tavrelctl deny'");
    } else if (domain && key) {
      const auto fault = faultOfPreference(*domain, *key, setting.get(kSettingValue));
      if (fault) findings.add(pathOf(kSettingValue), fault->what);
    }
    if (!setting.contains(kSettingValue)) findings.add(pathOf(kSettingValue), "is missing");
    if (domain && key && !settings.emplace(*domain, *key).second) {
      findings.add(path, "sets the same key as an earlier setting");
    }
  }
  return findings.take();
}

}  // namespace tavrel
