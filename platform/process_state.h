// State that lives as long as the process. Main owns it, `Platform` carries it.
#pragma once

#include <optional>

namespace tavrel {

struct ProcessState {
  /// A client announced app information that it has not delivered yet.
  bool appInfoRequested = false;

  /// The device-answers query "InternalBuild", asked once.
  std::optional<bool> isInternalDevice;
};

}  // namespace tavrel
