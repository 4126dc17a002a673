#include "report/faultline_preferences.h"

namespace tavrel {
namespace {

constexpr std::string_view kLibraryPath =
    "/System/Library/PrivateFrameworks/FaultlineSupport.framework/FaultlineSupport";

/// Fills `function` when the library has a function of that name and type.
template <class Function>
void find(DynamicLibrary& library, std::string_view name, Function& function) {
  LibraryFunction found = library.find(name);
  if (Function* typed = std::get_if<Function>(&found)) function = std::move(*typed);
}

}  // namespace

bool findFaultlinePreferences(Platform& platform) {
  auto& getter = platform.state->integerPreferenceGetter;
  auto& setter = platform.state->preferenceSetter;
  if (getter && setter) return true;

  const auto library = platform.dynamicLoader->load(kLibraryPath);
  if (!library) {
    platform.log->log(LogLevel::Error, "Failed to dynamically load the FaultlineSupport framework");
    return false;
  }
  if (!getter) {
    find(*library, "ZTXPreferencesGetIntegerValue", getter);
    if (!getter) {
      platform.log->log(LogLevel::Error,
                        "Failed to dyanmically link ZTXPreferencesGetIntegerValue");
    }
  }
  if (!setter) {
    find(*library, "ZTXPreferencesSetValue", setter);
    if (!setter) {
      platform.log->log(LogLevel::Error, "Failed to dynamically link ZTXPreferencesSetValue");
    }
  }
  return getter && setter;
}

}  // namespace tavrel
