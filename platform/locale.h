// The user's languages and region.
#pragma once

#include <optional>
#include <string>
#include <vector>

namespace tavrel {

/// Languages are tags such as "de", "zh-Hant" or "pt-BR", best first.
class Locale {
 public:
  virtual ~Locale() = default;

  virtual std::vector<std::string> preferredLanguages() = 0;
  virtual std::vector<std::string> systemLanguages() = 0;

  /// The languages of `available` that suit `preferred`, best first; when none does, the first of
  /// `available`. Empty without available or preferred languages.
  virtual std::vector<std::string> matchLocalizations(
      const std::vector<std::string>& available, const std::vector<std::string>& preferred) = 0;

  /// The country code of the current locale, such as "DE".
  virtual std::optional<std::string> countryCode() = 0;
};

}  // namespace tavrel
