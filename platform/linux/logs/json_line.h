// Values as JSON on one line.
//
// Integers are exact, even beyond the range of a double. Values that JSON lacks become strings:
// dates "2026-11-16T18:02:18.000Z", data in hexadecimal, and "nan", "inf", "-inf".
#pragma once

#include <string>

#include "base/plist.h"

namespace tavrel {

void appendJson(std::string& out, const plist::Value& value);

}  // namespace tavrel
