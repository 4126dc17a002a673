#include "platform/linux/device/linux_dynamic_loader.h"

#include <algorithm>
#include <utility>

#include "platform/linux/files/property_list_file.h"

namespace tavrel {
namespace {

constexpr std::string_view kPath = "/etc/tavrel/dynamic-libraries.plist";
constexpr std::string_view kFaultlineSupport =
    "/System/Library/PrivateFrameworks/FaultlineSupport.framework/FaultlineSupport";

class FaultlineSupport final : public DynamicLibrary {
 public:
  FaultlineSupport(Preferences& preferences, plist::Array missing)
      : preferences_(preferences), missing_(std::move(missing)) {}

  LibraryFunction find(std::string_view function) override {
    const bool isMissing =
        std::any_of(missing_.begin(), missing_.end(),
                    [&](const plist::Value& name) { return name.string() == function; });
    if (isMissing) return {};
    if (function == "ZTXPreferencesGetIntegerValue") {
      return IntegerPreferenceGetter(
          [&preferences = preferences_](std::string_view key, std::string_view domain) {
            return preferences.ZTXPreferencesGetIntegerValue(key, domain);
          });
    }
    if (function == "ZTXPreferencesSetValue") {
      return PreferenceSetter([&preferences = preferences_](std::string_view key,
                                                            const plist::Value& value,
                                                            std::string_view domain) {
        preferences.ZTXPreferencesSetValue(key, value, domain);
      });
    }
    return {};
  }

 private:
  Preferences& preferences_;
  plist::Array missing_;
};

}  // namespace

std::unique_ptr<DynamicLibrary> LinuxDynamicLoader::load(std::string_view path) {
  if (path != kFaultlineSupport) return nullptr;
  const plist::Value recorded =
      readDictionaryFile(files_, propertyLists_, log_, root_.path(kPath)).get(path);
  if (recorded.boolean() == false) return nullptr;
  return std::make_unique<FaultlineSupport>(preferences_, recorded.array());
}

}  // namespace tavrel
