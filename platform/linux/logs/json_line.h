// Values as JSON on one line.
//
// Integers are exact, also beyond what a double holds. What JSON has no form for becomes a string:
// dates "2026-11-16T18:02:18.000Z", data in hexadecimal, and "nan", "inf", "-inf".
#pragma once

#include <string>

#include "base/plist.h"

namespace tavrel {

void appendJson(std::string& out, const plist::Value& value);

}  // namespace tavrel
