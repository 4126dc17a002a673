// Services that a run only reads; each reports what was read.
#pragma once

#include <cstring>
#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "base/format.h"
#include "platform/platform.h"
#include "tools/overlay/overlay_events.h"

namespace tavrel {

class OverlayFileReader final : public FileReader {
 public:
  OverlayFileReader(FileReader& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  Expected<std::string> read(std::string_view path, std::size_t largest) override {
    auto content = contentOf(path, largest);
    events_.tell(OverlayEvent::Kind::File, std::string(path),
                 content ? plist::Value(std::uint64_t{content->size()})
                         : plist::Value(content.error().message));
    return content;
  }
  std::optional<std::int64_t> size(std::string_view path) override {
    const auto at = replaced.find(path);
    const auto size =
        at == replaced.end() ? below_.size(path) : static_cast<std::int64_t>(at->second.size());
    events_.tell(OverlayEvent::Kind::File, std::string(path),
                 size ? plist::Value(*size) : plist::Value());
    return size;
  }

  std::map<std::string, std::string, std::less<>> replaced;

 private:
  Expected<std::string> contentOf(std::string_view path, std::size_t largest) {
    const auto at = replaced.find(path);
    if (at == replaced.end()) return below_.read(path, largest);
    if (at->second.size() > largest) return Error{std::string(path) + ": the file is too large"};
    return at->second;
  }

  FileReader& below_;
  const OverlayEvents& events_;
};

class OverlayAnswers final : public DeviceAnswers {
 public:
  OverlayAnswers(DeviceAnswers& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  plist::Value SQCopyAnswer(std::string_view question) override {
    plist::Value answer = below_.SQCopyAnswer(question);
    events_.tell(OverlayEvent::Kind::Answer, std::string(question), answer);
    return answer;
  }

 private:
  DeviceAnswers& below_;
  const OverlayEvents& events_;
};

class OverlayControls final : public SystemControls {
 public:
  OverlayControls(SystemControls& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  Result read(std::string_view name, MutableByteSpan buffer) override {
    const Result result = below_.read(name, buffer);
    events_.tell(OverlayEvent::Kind::Control, std::string(name),
                 result.errorNumber == 0
                     ? plist::Value(plist::Data(ByteSpan(buffer).first(result.length)))
                     : plist::Value(format("error %d, %s", result.errorNumber,
                                           std::strerror(result.errorNumber))));
    return result;
  }

 private:
  SystemControls& below_;
  const OverlayEvents& events_;
};

class OverlaySystemVersion final : public SystemVersion {
 public:
  OverlaySystemVersion(SystemVersion& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  plist::Dictionary systemVersionDictionary() override {
    plist::Dictionary version = below_.systemVersionDictionary();
    events_.tell(OverlayEvent::Kind::Fact, "system version", version);
    return version;
  }

 private:
  SystemVersion& below_;
  const OverlayEvents& events_;
};

class OverlayApplications final : public PWApplicationWorkspace {
 public:
  OverlayApplications(PWApplicationWorkspace& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  void enumerateBundles(std::uint32_t kind,
                        const std::function<void(const PWBundleProxy&)>& handler) override {
    std::uint64_t count = 0;
    below_.enumerateBundles(kind, [&](const PWBundleProxy& bundle) {
      ++count;
      handler(bundle);
    });
    events_.tell(OverlayEvent::Kind::Fact, "number of installed applications", count);
  }

 private:
  PWApplicationWorkspace& below_;
  const OverlayEvents& events_;
};

class OverlayLocale final : public Locale {
 public:
  OverlayLocale(Locale& below, const OverlayEvents& events) : below_(below), events_(events) {}

  std::vector<std::string> preferredLanguages() override {
    return told("preferred languages", below_.preferredLanguages());
  }
  std::vector<std::string> systemLanguages() override {
    return told("languages of the system", below_.systemLanguages());
  }
  std::vector<std::string> matchLocalizations(const std::vector<std::string>& available,
                                              const std::vector<std::string>& preferred) override {
    return below_.matchLocalizations(available, preferred);
  }
  std::optional<std::string> countryCode() override {
    auto code = below_.countryCode();
    events_.tell(OverlayEvent::Kind::Fact, "country", code ? plist::Value(*code) : plist::Value());
    return code;
  }

 private:
  std::vector<std::string> told(const char* fact, std::vector<std::string> languages) {
    plist::Array list = plist::Array::create(languages.size());
    for (const std::string& language : languages)
      list.append(language);
    events_.tell(OverlayEvent::Kind::Fact, fact, list);
    return languages;
  }

  Locale& below_;
  const OverlayEvents& events_;
};

/// Library functions that access preferences use those of the overlay.
class OverlayLibrary final : public DynamicLibrary {
 public:
  OverlayLibrary(std::unique_ptr<DynamicLibrary> below, Preferences& preferences,
                 const OverlayEvents& events)
      : below_(std::move(below)), preferences_(preferences), events_(events) {}

  LibraryFunction find(std::string_view function) override {
    const LibraryFunction found = below_->find(function);
    events_.tell(OverlayEvent::Kind::Library, std::string(function), found.index() != 0);
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

 private:
  std::unique_ptr<DynamicLibrary> below_;
  Preferences& preferences_;
  const OverlayEvents& events_;
};

class OverlayLoader final : public DynamicLoader {
 public:
  OverlayLoader(DynamicLoader& below, Preferences& preferences, const OverlayEvents& events)
      : below_(below), preferences_(preferences), events_(events) {}

  std::unique_ptr<DynamicLibrary> load(std::string_view path) override {
    auto library = below_.load(path);
    events_.tell(OverlayEvent::Kind::Library, std::string(path), library != nullptr);
    if (!library) return nullptr;
    return std::make_unique<OverlayLibrary>(std::move(library), preferences_, events_);
  }

 private:
  DynamicLoader& below_;
  Preferences& preferences_;
  const OverlayEvents& events_;
};

}  // namespace tavrel
