#include "daemon/app_info.h"

#include <algorithm>

#include "base/uuid.h"
#include "platform/tallied_log.h"

namespace tavrel {
namespace {

std::int64_t numberOrZero(const plist::Dictionary& from, std::string_view key) {
  const auto number = from.number(key);
  return number ? number->int64() : 0;
}

}  // namespace

std::optional<std::string> appUuidFrom(const plist::Value& value) {
  if (const auto text = value.string()) return normalisedUuid(*text);
  const plist::Data data = value.data();
  UuidBytes bytes;
  if (data.size() != bytes.size()) return std::nullopt;
  std::ranges::copy(data.bytes(), bytes.begin());
  return uuidText(bytes);
}

plist::Array appInfoFrom(const plist::Array& appData) {
  plist::Array entries = plist::Array::create(appData.size());
  for (const plist::Value& element : appData) {
    const plist::Dictionary app = element.dictionary();
    const auto bundle = app.string("bundle_id");
    const auto version = app.string("version");
    const auto uuid = appUuidFrom(app.get("uuid"));
    if (!bundle || !version || !uuid) continue;
    entries.append(plist::Dictionary{{kAppBundle, app.get("bundle_id")},
                                     {kAppVersion, app.get("version")},
                                     {kAppOrboID, numberOrZero(app, "orbo_id")},
                                     {kAppArch, numberOrZero(app, "arch")},
                                     {kAppUuid, *uuid}});
  }
  return entries;
}

}  // namespace tavrel
