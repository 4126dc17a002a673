// Values as text for people and for the receivers of logs.
//
// Strings and numbers are plain, booleans are 1 and 0, dates "2026-11-16 18:02:18 +0000", data
// hexadecimal in angle brackets. Containers are on one line, as in JSON, with strings, dates and
// data quoted. A null object is "(null)".
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "base/civil_time.h"
#include "base/plist.h"

namespace tavrel {

/// The shortest decimal text that reads back to the same double. Integers up to 2^53 have no
/// exponent, so that a double and an integer of the same value have the same text. The infinities
/// are "inf" and "-inf", negative zero is "-0", not-a-number is "nan" whatever its sign.
std::string numberText(double value);
std::string numberText(const plist::Number& value);

/// The second in which an instant lies, in UTC; nothing for instants outside the calendar.
std::optional<CivilTime> civilTimeOf(plist::Date instant);

/// "2026-11-16 18:02:18 +0000", in UTC, without fractions of a second. Instants outside the
/// calendar are "@" and the number of seconds since 1970.
std::string dateText(plist::Date date);

/// Appends lower-case hexadecimal, two digits per byte.
void appendHex(std::string& out, ByteSpan bytes);

/// Appends `text` in quotation marks, escaped as in JSON; malformed UTF-8 is repaired.
void appendQuoted(std::string& out, std::string_view text);
std::string quotedText(std::string_view text);

void appendText(std::string& out, const plist::Value& value);
std::string textOf(const plist::Value& value);

}  // namespace tavrel
