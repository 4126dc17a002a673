// Property-list values on a command line: a text and its intended type.
#pragma once

#include <cstdint>
#include <string_view>

#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

enum class ArgumentKind : std::uint8_t { Text, Boolean, Integer, Real, Date };

/// The error says what form is expected.
Expected<plist::Value> parseArgument(std::string_view text, ArgumentKind kind);

/// Whether an XML property list can represent all texts and keys in `value`.
bool hasXmlTextsOnly(const plist::Value& value);

}  // namespace tavrel
