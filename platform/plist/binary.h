// The binary encoding of property lists, which begins with "bplist00".
//
// A document is a header, objects, a table of their offsets and a trailer of 32 bytes. Objects
// refer to each other by number, so a string or number used in many places is written once. All
// words are big-endian.
//
//   const auto document = plist::readBinary(bytes);
//   if (!document) log(document.error().message);  // "binary property list, offset 8: ..."
//
// Written values read back equal, except for malformed UTF-8: each such byte becomes U+FFFD (keys
// that become equal are distinguished as in platform/plist/xml.h). Floats and doubles keep their
// kind; integers are read as 64-bit integers.
#pragma once

#include <string>

#include "base/bytes.h"
#include "base/expected.h"
#include "base/plist.h"

namespace tavrel::plist {

/// Keys are in the order of their bytes. Fails for a value that is or contains null, and for a
/// document that the limits of base/limits.h would refuse to read, where malformed UTF-8 counts
/// with its own bytes.
Expected<std::string> writeBinary(const Value& value);

/// The value is the caller's own: a container or data object that the document refers to from
/// several places becomes several values. Of two equal keys in one dictionary the later wins.
Expected<Value> readBinary(ByteSpan bytes);

}  // namespace tavrel::plist
