// Preferences: values by key, kept per domain.
//
// A write is visible to this process at once and durable once its domain is synchronised. Values
// read are the caller's own.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

#include "base/plist.h"

namespace tavrel {

class Preferences {
 public:
  virtual ~Preferences() = default;

  /// Largest size in bytes of a key and its value as XML: no single value may fill a shared domain.
  static constexpr std::size_t kLargestChange = 1U << 20;

  /// Null when the key is absent or its domain cannot be read.
  virtual plist::Value ZTXPreferencesGetValue(std::string_view key, std::string_view domain) = 0;

  /// Stores `value`; a null value removes the key. A value that XML cannot hold or that needs more
  /// than `kLargestChange` is dropped, with a line in the system log when the domain is
  /// synchronised.
  virtual void ZTXPreferencesSetValue(std::string_view key, const plist::Value& value,
                                      std::string_view domain) = 0;

  /// Writes the domain to storage and reads what other processes have written. False when the
  /// domain could not be written; its changes are then kept for the next attempt.
  virtual bool ZTXPreferencesSynchronize(std::string_view domain) = 0;

  /// The value as an integer, 0 when it is absent or not a number. `keyExistsAndHasValidFormat`
  /// distinguishes a stored 0 from these cases.
  std::int64_t ZTXPreferencesGetIntegerValue(std::string_view key, std::string_view domain,
                                             bool* keyExistsAndHasValidFormat = nullptr);

  /// The value when it is a boolean, otherwise false.
  bool ZTXPreferencesGetBoolValue(std::string_view key, std::string_view domain,
                                  bool* keyExistsAndHasValidFormat = nullptr);
};

}  // namespace tavrel
