// Property-list values from a command line: a text and its intended kind.
#pragma once

#include <cstdint>
#include <string_view>

#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

enum class ArgumentKind : std::uint8_t { Text, Boolean, Integer, Real, Date };

/// The error says what is expected.
Expected<plist::Value> parseArgument(std::string_view text, ArgumentKind kind);

/// Whether an XML property list can hold all texts and keys in `value`.
bool hasXmlTextsOnly(const plist::Value& value);

}  // namespace tavrel
