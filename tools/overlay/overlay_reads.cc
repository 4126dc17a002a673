#include "tools/overlay/overlay_reads.h"

#include "base/format.h"
#include "base/system_text.h"

namespace tavrel {

Expected<std::string> OverlayFileReader::read(std::string_view path, std::size_t largest) {
  auto content = contentOf(path, largest);
  events_.deliver(OverlayEvent::Kind::File, std::string(path),
                  content ? plist::Value(std::uint64_t{content->size()})
                          : plist::Value(content.error().message));
  return content;
}

std::optional<std::int64_t> OverlayFileReader::size(std::string_view path) {
  const auto at = replaced.find(path);
  const auto size =
      at == replaced.end() ? below_.size(path) : static_cast<std::int64_t>(at->second.size());
  events_.deliver(OverlayEvent::Kind::File, std::string(path),
                  size ? plist::Value(*size) : plist::Value());
  return size;
}

Expected<std::string> OverlayFileReader::contentOf(std::string_view path, std::size_t largest) {
  const auto at = replaced.find(path);
  if (at == replaced.end()) return below_.read(path, largest);
  if (at->second.size() > largest) return Error{std::string(path) + ": the file is too large"};
  return at->second;
}

plist::Value OverlayAnswers::SQCopyAnswer(std::string_view question) {
  plist::Value answer = below_.SQCopyAnswer(question);
  events_.deliver(OverlayEvent::Kind::Answer, std::string(question), answer);
  return answer;
}

SystemControls::Result OverlayControls::read(std::string_view name, MutableByteSpan buffer) {
  const Result result = below_.read(name, buffer);
  events_.deliver(OverlayEvent::Kind::Control, std::string(name),
                  result.errorNumber == 0
                      ? plist::Value(plist::Data(ByteSpan(buffer).first(result.length)))
                      : plist::Value(format("error %d, %s", result.errorNumber,
                                            systemText(result.errorNumber))));
  return result;
}

plist::Dictionary OverlaySystemVersion::systemVersionDictionary() {
  plist::Dictionary version = below_.systemVersionDictionary();
  events_.deliver(OverlayEvent::Kind::Fact, "system version", version);
  return version;
}

void OverlayApplications::enumerateBundles(
    std::uint32_t kind, const std::function<void(const PWBundleProxy&)>& handler) {
  std::uint64_t count = 0;
  below_.enumerateBundles(kind, [&](const PWBundleProxy& bundle) {
    ++count;
    handler(bundle);
  });
  events_.deliver(OverlayEvent::Kind::Fact, "number of installed applications", count);
}

std::vector<std::string> OverlayLocale::preferredLanguages() {
  return delivered("preferred languages", below_.preferredLanguages());
}

std::vector<std::string> OverlayLocale::systemLanguages() {
  return delivered("languages of the system", below_.systemLanguages());
}

std::vector<std::string> OverlayLocale::matchLocalizations(
    const std::vector<std::string>& available, const std::vector<std::string>& preferred) {
  return below_.matchLocalizations(available, preferred);
}

std::optional<std::string> OverlayLocale::countryCode() {
  auto code = below_.countryCode();
  events_.deliver(OverlayEvent::Kind::Fact, "country", code ? plist::Value(*code) : plist::Value());
  return code;
}

std::vector<std::string> OverlayLocale::delivered(const char* fact,
                                                  std::vector<std::string> languages) {
  plist::Array list = plist::Array::create(languages.size());
  for (const std::string& language : languages)
    list.append(language);
  events_.deliver(OverlayEvent::Kind::Fact, fact, list);
  return languages;
}

LibraryFunction OverlayLibrary::find(std::string_view function) {
  const LibraryFunction found = below_->find(function);
  events_.deliver(OverlayEvent::Kind::Library, std::string(function), found.index() != 0);
  Preferences& preferences = preferences_;
  if (std::holds_alternative<IntegerPreferenceGetter>(found)) {
    return IntegerPreferenceGetter([&preferences](std::string_view key, std::string_view domain) {
      return preferences.ZTXPreferencesGetIntegerValue(key, domain);
    });
  }
  if (std::holds_alternative<PreferenceSetter>(found)) {
    return PreferenceSetter(
        [&preferences](std::string_view key, const plist::Value& value, std::string_view domain) {
          preferences.ZTXPreferencesSetValue(key, value, domain);
        });
  }
  return found;
}

std::unique_ptr<DynamicLibrary> OverlayLoader::load(std::string_view path) {
  auto library = below_.load(path);
  events_.deliver(OverlayEvent::Kind::Library, std::string(path), library != nullptr);
  if (!library) return nullptr;
  return std::make_unique<OverlayLibrary>(std::move(library), preferences_, events_);
}

}  // namespace tavrel
