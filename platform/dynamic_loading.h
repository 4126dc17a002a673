// Libraries loaded at run time, and the functions that they offer.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string_view>
#include <variant>

#include "base/plist.h"

namespace tavrel {

using IntegerPreferenceGetter =
    std::function<std::int64_t(std::string_view key, std::string_view domain)>;
using PreferenceSetter =
    std::function<void(std::string_view key, const plist::Value& value, std::string_view domain)>;

/// A function found in a library, by its type; nothing when the library does not have it.
using LibraryFunction = std::variant<std::monostate, IntegerPreferenceGetter, PreferenceSetter>;

class DynamicLibrary {
 public:
  virtual ~DynamicLibrary() = default;
  virtual LibraryFunction find(std::string_view function) = 0;
};

class DynamicLoader {
 public:
  virtual ~DynamicLoader() = default;
  /// Loads with lazy binding and local symbols. Null when the library does not load.
  virtual std::unique_ptr<DynamicLibrary> load(std::string_view path) = 0;
};

}  // namespace tavrel
