// Property-list values as a command line gives them: a text and the kind that it is meant to be.
#pragma once

#include <cstdint>
#include <string_view>

#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

enum class ArgumentKind : std::uint8_t { Text, Boolean, Integer, Real, Date };

/// The error says what is expected.
Expected<plist::Value> parseArgument(std::string_view text, ArgumentKind kind);

/// Whether XML gives the text back: UTF-8 without control characters but tabs and line ends.
bool isXmlText(std::string_view text);
/// Whether that is so of all texts and keys in `value`.
bool hasXmlTextsOnly(const plist::Value& value);

}  // namespace tavrel
