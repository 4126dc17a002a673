// Property-list values as JSON and back.
//
// Dictionaries, arrays, strings, booleans and numbers are their JSON counterparts; integers are
// exact over the whole range of 64 bits, and a real number has a point or an exponent. What JSON
// lacks is an object with one member:
//
//   {"$data": "AQI="}                   bytes, in base64
//   {"$date": "2026-11-16T18:02:18Z"}   an instant, UTC, with a fraction when it has one
//   {"$real": "nan"}                    "nan", "inf" or "-inf"
//
// A key of a dictionary that begins with "$" gets a second one, so that it is not mistaken for
// these.
#pragma once

#include <nlohmann/json_fwd.hpp>
#include <string>
#include <string_view>

#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

/// Keys are sorted. A null value gives null.
nlohmann::ordered_json jsonOf(const plist::Value& value);

/// Reads a document. The error says what is wrong and where.
Expected<plist::Value> parseJsonValue(std::string_view text);

}  // namespace tavrel
