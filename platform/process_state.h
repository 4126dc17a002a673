// State that lives as long as the process. Main owns it, `Platform` carries it.
#pragma once

#include <optional>

#include "platform/dynamic_loading.h"

namespace tavrel {

struct ProcessState {
  /// A client announced app information that it has not delivered yet.
  bool appInfoRequested = false;

  /// A client's announcement or forced day has been acted upon; no further one is.
  bool clientRequestHandled = false;

  /// The device-answers query "InternalBuild", asked once.
  std::optional<bool> isInternalDevice;

  /// Functions found in a dynamically loaded library, empty until they are.
  IntegerPreferenceGetter integerPreferenceGetter;
  PreferenceSetter preferenceSetter;
};

}  // namespace tavrel
