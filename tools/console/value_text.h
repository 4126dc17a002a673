// Shows property-list values to people.
#pragma once

#include <cstddef>
#include <iosfwd>
#include <string>
#include <string_view>

#include "base/plist.h"

namespace tavrel {

/// "boolean", "integer", "real", "date", "string", "data", "array" or "dictionary".
std::string_view kindName(const plist::Value& value);

/// The same with an article, for messages: "an integer".
std::string kindWithArticle(const plist::Value& value);

/// A value on one line that shows its type: true, 12, 2.0, "text", 2026-11-16 18:02:18 +0000,
/// <0102>, [1, {"key": 2}] with sorted keys.
std::string inlineText(const plist::Value& value);

/// A number with at most ten digits, and at most nine significant ones when it has a fraction: only
/// programs need longer ones.
std::string shortNumber(double value);

/// Prints a value over several lines; the content of containers is indented by two blanks
/// per level. Keys are sorted.
void printOutline(std::ostream& out, const plist::Value& value, std::size_t indent = 0);

}  // namespace tavrel
