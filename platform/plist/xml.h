// The XML encoding of property lists.
//
// The writer produces UTF-8 without a document-type line, with tabs, and with keys in the order of
// their bytes, so that equal values give equal bytes (here an integer and a real of the same value
// differ). The reader takes any encoding that Expat knows, with or without a document-type line; it
// declares and expands no entity and fetches nothing.
//
//   const auto document = plist::readXml(bytes);
//   if (!document) log(document.error().message);  // "XML property list, line 3, column 7: ..."
//
// Written values read back equal, except for what XML cannot hold:
//   - control characters (other than tab, line feed and carriage return), U+FFFE, U+FFFF and
//     malformed UTF-8 become U+FFFD. The later of keys that become equal get a number: "a\x01",
//     "a\x02" are written as "a\uFFFD", "a\uFFFD2";
//   - a date loses its fraction of a second (it is rounded down);
//   - a float is read as the double of the same value, an integer as a 64-bit one.
#pragma once

#include <string>

#include "base/bytes.h"
#include "base/expected.h"
#include "base/plist.h"

namespace tavrel::plist {

/// Fails for a value that is or contains null, a date beyond the calendar (not a number, or more
/// than 10^9 years off), and for a document that nests too deeply or is too long to be read back. A
/// value with more nodes than `readXml` accepts is still written: better a large log than a lost
/// one.
Expected<std::string> writeXml(const Value& value);

/// The value is the caller's own. Running out of memory is not an error of the document: it throws
/// std::bad_alloc. Of two equal keys in one dictionary the later wins.
Expected<Value> readXml(ByteSpan bytes);

}  // namespace tavrel::plist
