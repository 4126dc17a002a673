#include "fleet/logs/binary_log.h"

#include "platform/plist/binary.h"

namespace tavrel::fleet {
namespace {

// Recursion is safe: the reader has already bounded the depth of the document.
bool build(LogBuilder& builder, const plist::Value& value) {
  if (const auto dictionary = value.dictionary()) {
    if (!builder.begin(true)) return false;
    for (const plist::Entry& entry : dictionary) {
      if (!builder.key(entry.key.view()) || !build(builder, entry.value)) return false;
    }
    return builder.end();
  }
  if (const auto array = value.array()) {
    if (!builder.begin(false)) return false;
    for (const plist::Value& element : array) {
      if (!build(builder, element)) return false;
    }
    return builder.end();
  }
  if (const auto text = value.string()) return builder.string(*text);
  if (const auto number = value.number()) {
    return number->isFloating() ? builder.real(number->real()) : builder.integer(*number);
  }
  if (const auto date = value.date()) return builder.date(*date);
  return builder.other();
}

}  // namespace

std::string readBinaryLog(ByteSpan document, LogBuilder& builder) {
  const auto value = plist::readBinary(document);
  if (!value) return value.error().message;
  return build(builder, *value) ? std::string() : builder.fault();
}

}  // namespace tavrel::fleet
