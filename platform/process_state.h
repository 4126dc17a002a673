// State that lives as long as the process. `main` owns it, `Platform` carries it.
#pragma once

#include <optional>

#include "platform/dynamic_loading.h"

namespace tavrel {

struct ProcessState {
  /// A client has announced app information and not delivered it yet.
  bool appInfoRequested = false;

  /// The process has received a request other than a delivery, known or not, and ignores further
  /// ones.
  bool clientRequestHandled = false;

  /// The device-answers query "InternalBuild", asked once.
  std::optional<bool> isInternalDevice;

  /// Functions found in a dynamically loaded library, empty until they are.
  IntegerPreferenceGetter integerPreferenceGetter;
  PreferenceSetter preferenceSetter;
};

}  // namespace tavrel
