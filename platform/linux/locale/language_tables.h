// Facts about languages beyond their tags: scripts and regions.
#pragma once

#include <array>
#include <string>
#include <string_view>

namespace tavrel::language_tables {

/// The current code for a withdrawn one ("iw" is "he"), otherwise the code itself.
std::string_view currentCode(std::string_view language);

/// "Latn" for "latin", empty for modifiers that do not name a script.
std::string_view scriptOfModifier(std::string_view modifier);

/// The script of a language in a region (which may be empty); "Latn" for unknown ones.
std::string_view usualScript(std::string_view language, std::string_view region);

/// The region whose variety a bare language stands for: "BR" for "pt".
std::string homeRegion(std::string_view language, std::string_view script);

/// Regions whose variety serves a region best when its own is missing, best first; unused entries
/// are empty. Readers in Mexico take "es-419" before "es", those in Macao "zh-Hant-HK".
std::array<std::string_view, 2> parentRegions(std::string_view language, std::string_view script,
                                              std::string_view region);

}  // namespace tavrel::language_tables
