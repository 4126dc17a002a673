// Services that a run only reads; each reports what was read.
#pragma once

#include <map>
#include <memory>
#include <string>
#include <utility>
#include <vector>

#include "platform/platform.h"
#include "tools/overlay/overlay_events.h"

namespace tavrel {

class OverlayFileReader final : public FileReader {
 public:
  OverlayFileReader(FileReader& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  Expected<std::string> read(std::string_view path, std::size_t largest) override;
  std::optional<std::int64_t> size(std::string_view path) override;

  std::map<std::string, std::string, std::less<>> replaced;

 private:
  Expected<std::string> contentOf(std::string_view path, std::size_t largest);

  FileReader& below_;
  const OverlayEvents& events_;
};

class OverlayAnswers final : public DeviceAnswers {
 public:
  OverlayAnswers(DeviceAnswers& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  plist::Value SQCopyAnswer(std::string_view question) override;

 private:
  DeviceAnswers& below_;
  const OverlayEvents& events_;
};

class OverlayControls final : public SystemControls {
 public:
  OverlayControls(SystemControls& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  Result read(std::string_view name, MutableByteSpan buffer) override;

 private:
  SystemControls& below_;
  const OverlayEvents& events_;
};

class OverlaySystemVersion final : public SystemVersion {
 public:
  OverlaySystemVersion(SystemVersion& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  plist::Dictionary systemVersionDictionary() override;

 private:
  SystemVersion& below_;
  const OverlayEvents& events_;
};

class OverlayApplications final : public PWApplicationWorkspace {
 public:
  OverlayApplications(PWApplicationWorkspace& below, const OverlayEvents& events)
      : below_(below), events_(events) {}

  void enumerateBundles(std::uint32_t kind,
                        const std::function<void(const PWBundleProxy&)>& handler) override;

 private:
  PWApplicationWorkspace& below_;
  const OverlayEvents& events_;
};

class OverlayLocale final : public Locale {
 public:
  OverlayLocale(Locale& below, const OverlayEvents& events) : below_(below), events_(events) {}

  std::vector<std::string> preferredLanguages() override;
  std::vector<std::string> systemLanguages() override;
  std::vector<std::string> matchLocalizations(const std::vector<std::string>& available,
                                              const std::vector<std::string>& preferred) override;
  std::optional<std::string> countryCode() override;

 private:
  std::vector<std::string> delivered(const char* fact, std::vector<std::string> languages);

  Locale& below_;
  const OverlayEvents& events_;
};

/// Library functions that access preferences use those of the overlay.
class OverlayLibrary final : public DynamicLibrary {
 public:
  OverlayLibrary(std::unique_ptr<DynamicLibrary> below, Preferences& preferences,
                 const OverlayEvents& events)
      : below_(std::move(below)), preferences_(preferences), events_(events) {}

  LibraryFunction find(std::string_view function) override;

 private:
  std::unique_ptr<DynamicLibrary> below_;
  Preferences& preferences_;
  const OverlayEvents& events_;
};

class OverlayLoader final : public DynamicLoader {
 public:
  OverlayLoader(DynamicLoader& below, Preferences& preferences, const OverlayEvents& events)
      : below_(below), preferences_(preferences), events_(events) {}

  std::unique_ptr<DynamicLibrary> load(std::string_view path) override;

 private:
  DynamicLoader& below_;
  Preferences& preferences_;
  const OverlayEvents& events_;
};

}  // namespace tavrel
