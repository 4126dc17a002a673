// Languages, as tags ("sr-Latn-RS") and as names of locales ("sr_RS.UTF-8@latin").
#pragma once

#include <optional>
#include <string>
#include <string_view>

namespace tavrel {

struct LanguageTag {
  std::string language;  // "sr"
  std::string script;    // "Latn", empty when not given
  std::string region;    // "RS" or "419", empty when not given
  std::string variant;   // "valencia", empty when not given

  std::string text() const;
  /// The script of the language in that region, when the tag gives none.
  std::string_view effectiveScript() const;

  friend bool operator==(const LanguageTag&, const LanguageTag&) = default;
};

/// Reads either form, in upper or lower case. Ignores the encoding of a locale name; its modifier
/// may give the script or the variant. Nothing for "C", "POSIX" and texts that do not name a
/// language.
std::optional<LanguageTag> parseLanguageTag(std::string_view name);

}  // namespace tavrel
