#include "platform/linux/locale/language_tag.h"

#include <algorithm>

#include "base/ascii.h"
#include "platform/linux/locale/language_tables.h"

namespace tavrel {
namespace {

bool allLetters(std::string_view text) {
  return std::all_of(text.begin(), text.end(), isLetter);
}
bool allDigits(std::string_view text) {
  return std::all_of(text.begin(), text.end(), isDigit);
}
bool lettersOrDigits(std::string_view text) {
  return std::all_of(text.begin(), text.end(), isLetterOrDigit);
}

std::string lower(std::string_view text) {
  std::string out(text);
  for (char& c : out) {
    if (c >= 'A' && c <= 'Z') c = static_cast<char>(c - 'A' + 'a');
  }
  return out;
}

std::string upper(std::string_view text) {
  std::string out(text);
  for (char& c : out) {
    if (c >= 'a' && c <= 'z') c = static_cast<char>(c - 'a' + 'A');
  }
  return out;
}

std::string_view takePart(std::string_view& rest) {
  const std::size_t end = std::min(rest.find_first_of("_-"), rest.size());
  const std::string_view part = rest.substr(0, end);
  rest.remove_prefix(std::min(end + 1, rest.size()));
  return part;
}

/// Stores a part that follows the language; false when it is not one.
bool takeSubtag(LanguageTag& tag, std::string_view part) {
  if (!lettersOrDigits(part)) return false;
  const bool beforeVariant = tag.variant.empty();
  const bool beforeRegion = beforeVariant && tag.region.empty();
  if (part.size() == 4 && allLetters(part) && beforeRegion && tag.script.empty()) {
    tag.script = upper(part.substr(0, 1)) + lower(part.substr(1));
  } else if (((part.size() == 2 && allLetters(part)) || (part.size() == 3 && allDigits(part))) &&
             beforeRegion) {
    tag.region = upper(part);
  } else if (part.size() >= (part.empty() || !isDigit(part.front()) ? 5U : 4U) &&
             part.size() <= 8) {
    tag.variant += (beforeVariant ? "" : "-") + lower(part);
  } else {
    return false;
  }
  return true;
}

}  // namespace

std::string LanguageTag::text() const {
  std::string out = language;
  for (const std::string* part : {&script, &region, &variant}) {
    if (!part->empty()) out += "-" + *part;
  }
  return out;
}

std::string_view LanguageTag::effectiveScript() const {
  return script.empty() ? language_tables::usualScript(language, region) : script;
}

std::optional<LanguageTag> parseLanguageTag(std::string_view name) {
  std::string_view modifier;
  if (const std::size_t at = name.find('@'); at != std::string_view::npos) {
    modifier = name.substr(at + 1);
    name = name.substr(0, at);
  }
  name = name.substr(0, name.find('.'));

  LanguageTag tag;
  const std::string_view language = takePart(name);
  if (language.size() < 2 || language.size() > 3 || !allLetters(language)) return std::nullopt;
  tag.language = language_tables::currentCode(lower(language));
  while (!name.empty()) {
    const std::string_view part = takePart(name);
    // A single letter begins an extension, which says nothing about the language.
    if (part.size() == 1 && lettersOrDigits(part)) break;
    if (!takeSubtag(tag, part)) return std::nullopt;
  }

  const std::string known = lower(modifier);
  if (tag.script.empty()) tag.script = language_tables::scriptOfModifier(known);
  if (tag.variant.empty() && known == "valencia") tag.variant = known;
  return tag;
}

}  // namespace tavrel
