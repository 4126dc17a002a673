// Loads logs from many places into the tables.
#pragma once

#include <cstddef>
#include <functional>
#include <optional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "fleet/engine/engine.h"

namespace tavrel::fleet {

struct LoadRequest {
  std::vector<std::string> paths;
  std::vector<std::string> uploadLines;  // files with the metadata that an upload server noted
  std::vector<std::string> whitelists;   // when there are none, all keys are permitted
  std::optional<std::string> setAside;   // folder for copies of refused logs; not read
};

struct LoadCounts {
  std::size_t loaded = 0;
  std::size_t known = 0;  // were in the tables before, or came twice
  std::size_t refused = 0;
  std::size_t others = 0;           // logs of another kind
  std::size_t tooNew = 0;           // left to the next load: their metadata may still follow
  std::size_t withoutMetadata = 0;  // of those loaded: they never get an OS version
};

struct LoadListener {
  /// Takes lines about refused and skipped files, in the order in which these were found.
  std::function<void(std::string_view line)> note;
  std::function<void(const LoadCounts& counts)> progress;
};

/// Fails when something that the request itself names cannot be read, or a refused log cannot be
/// set aside. Throws EngineError. What was filed before a failure stays filed.
Expected<LoadCounts> load(Engine& engine, const LoadRequest& request, const LoadListener& listener);

}  // namespace tavrel::fleet
