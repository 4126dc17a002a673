// Property-list documents. Both encodings are recognised by content when reading.
#pragma once

#include <string>

#include "base/bytes.h"
#include "base/expected.h"
#include "base/plist.h"

namespace tavrel {

class PropertyListCoding {
 public:
  virtual ~PropertyListCoding() = default;

  /// Equal values give equal bytes: keys are sorted.
  virtual Expected<std::string> encodeXml(const plist::Value& value) = 0;

  /// The error says what is wrong and where.
  virtual Expected<plist::Value> decode(ByteSpan bytes) = 0;
};

}  // namespace tavrel
