#include "daemon/app_info.h"

#include "base/text.h"

namespace tavrel {
namespace {

constexpr std::size_t kUuidBytes = 16;
constexpr std::size_t kUuidCharacters = 36;

constexpr bool isGroupEnd(std::size_t character) {
  return character == 8 || character == 13 || character == 18 || character == 23;
}

char upper(char c) {
  return c >= 'a' && c <= 'f' ? static_cast<char>(c - 'a' + 'A') : c;
}

bool isHexDigit(char c) {
  return (c >= '0' && c <= '9') || (c >= 'a' && c <= 'f') || (c >= 'A' && c <= 'F');
}

std::string textFromBytes(ByteSpan bytes) {
  std::string digits;
  appendHex(digits, bytes);
  std::string text;
  for (const char digit : digits) {
    if (isGroupEnd(text.size())) text += '-';
    text += upper(digit);
  }
  return text;
}

std::optional<std::string> normalisedText(std::string_view text) {
  if (text.size() != kUuidCharacters) return std::nullopt;
  std::string normalised;
  for (const char c : text) {
    if (isGroupEnd(normalised.size()) ? c != '-' : !isHexDigit(c)) return std::nullopt;
    normalised += upper(c);
  }
  return normalised;
}

std::int64_t numberOrZero(const plist::Dictionary& from, std::string_view key) {
  const auto number = from.number(key);
  return number ? number->int64() : 0;
}

}  // namespace

std::optional<std::string> uuidText(const plist::Value& uuid) {
  if (const auto text = uuid.string()) return normalisedText(*text);
  const plist::Data data = uuid.data();
  if (data.size() != kUuidBytes) return std::nullopt;
  return textFromBytes(data.bytes());
}

plist::Array appInfoFrom(const plist::Array& appData) {
  plist::Array entries = plist::Array::create(appData.size());
  for (const plist::Value& element : appData) {
    const plist::Dictionary app = element.dictionary();
    const auto bundle = app.string("bundle_id");
    const auto version = app.string("version");
    const auto uuid = uuidText(app.get("uuid"));
    if (!bundle || !version || !uuid) continue;
    entries.append(plist::Dictionary{{"bundle", app.get("bundle_id")},
                                     {"version", app.get("version")},
                                     {"orboID", numberOrZero(app, "orbo_id")},
                                     {"arch", numberOrZero(app, "arch")},
                                     {"uuid", *uuid}});
  }
  return entries;
}

}  // namespace tavrel
