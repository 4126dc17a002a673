// Property-list coding as a platform service, and a reader of both encodings.
#pragma once

#include <string>

#include "base/bytes.h"
#include "base/expected.h"
#include "base/plist.h"
#include "platform/property_list_coding.h"

namespace tavrel::plist {

/// Whether the bytes begin as an XML or a binary document does.
bool isPropertyList(ByteSpan bytes);

/// Reads an XML or a binary document, recognised by content.
Expected<Value> read(ByteSpan bytes);

/// Stateless: one object can serve all users.
class PlistCoding final : public PropertyListCoding {
 public:
  Expected<std::string> encodeXml(const Value& value) override;
  Expected<Value> decode(ByteSpan bytes) override;
};

}  // namespace tavrel::plist
