// Instants in ISO 8601 format, in UTC.
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

/// Appends "2026-11-16T18:02:18Z", rounded down to the second. False, and nothing appended, for an
/// instant outside the calendar (base/civil_time.h).
bool appendIsoInstant(std::string& out, plist::Date instant);

/// Reads the form that `appendIsoInstant` writes.
std::optional<plist::Date> parseIsoInstant(std::string_view text);

/// The same with a fraction of a second, if there is one: "2026-11-16T18:02:18.25Z". Instants
/// outside the calendar are "@" and seconds since 1970.
std::string isoDateText(plist::Date instant);

/// Reads the forms that `isoDateText` writes, and plain dates, "2026-11-16". The error says what is
/// expected.
Expected<plist::Date> parseIsoDate(std::string_view text);

}  // namespace tavrel
