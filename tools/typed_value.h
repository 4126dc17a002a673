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

}  // namespace tavrel
