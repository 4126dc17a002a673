#include "platform/preferences.h"

namespace tavrel {

std::int64_t Preferences::ZTXPreferencesGetIntegerValue(std::string_view key,
                                                        std::string_view domain,
                                                        bool* keyExistsAndHasValidFormat) {
  const auto number = ZTXPreferencesGetValue(key, domain).number();
  if (keyExistsAndHasValidFormat) *keyExistsAndHasValidFormat = number.has_value();
  return number ? number->int64() : 0;
}

bool Preferences::ZTXPreferencesGetBoolValue(std::string_view key, std::string_view domain,
                                             bool* keyExistsAndHasValidFormat) {
  const auto boolean = ZTXPreferencesGetValue(key, domain).boolean();
  if (keyExistsAndHasValidFormat) *keyExistsAndHasValidFormat = boolean.has_value();
  return boolean.value_or(false);
}

}  // namespace tavrel
