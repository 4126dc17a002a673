// Property-list values as JSON and back.
//
// Dictionaries, arrays, strings, booleans and numbers map to their JSON counterparts. Integers are
// exact over the whole 64-bit range, and a real number has a point or an exponent. Types that JSON
// lacks become an object with one member:
//
//   {"$data": "AQI="}                   bytes, in base64
//   {"$date": "2026-11-16T18:02:18Z"}   an instant in UTC, with a fraction if it has one
//   {"$real": "nan"}                    "nan", "inf" or "-inf"
//
// A dictionary key that begins with "$" gets a second one, so that it cannot be
// mistaken for one of these.
#pragma once

#include <nlohmann/json_fwd.hpp>
#include <string_view>

#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

/// Keys are sorted. A null value becomes null.
nlohmann::ordered_json jsonOf(const plist::Value& value);

/// Reads a document. The error says what is wrong and where.
Expected<plist::Value> parseJsonValue(std::string_view text);

}  // namespace tavrel
