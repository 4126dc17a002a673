#include "platform/plist/coding.h"

#include <string_view>

#include "platform/plist/binary.h"
#include "platform/plist/xml.h"

namespace tavrel::plist {
namespace {

bool looksBinary(std::string_view text) {
  return text.starts_with("bplist");
}

// Any XML document begins with "<", after an optional byte-order mark and white space.
bool looksLikeXml(std::string_view text) {
  using namespace std::string_view_literals;
  for (const std::string_view start : {"\xFE\xFF"sv, "\xFF\xFE"sv, "<\0"sv, "\0<"sv}) {
    if (text.starts_with(start)) return true;
  }
  if (text.starts_with("\xEF\xBB\xBF")) text.remove_prefix(3);
  const std::size_t first = text.find_first_not_of(" \t\r\n");
  return first != std::string_view::npos && text[first] == '<';
}

}  // namespace

bool isPropertyList(ByteSpan bytes) {
  return looksBinary(asText(bytes)) || looksLikeXml(asText(bytes));
}

Expected<Value> read(ByteSpan bytes) {
  const std::string_view text = asText(bytes);
  if (looksBinary(text)) return readBinary(bytes);
  if (looksLikeXml(text)) return readXml(bytes);
  if (text.empty()) return Error{"not a property list: the document is empty"};
  return Error{"not a property list: it begins neither with \"bplist00\" nor with \"<\""};
}

Expected<std::string> PlistCoding::encodeXml(const Value& value) {
  return writeXml(value);
}

Expected<Value> PlistCoding::decode(ByteSpan bytes) {
  return read(bytes);
}

}  // namespace tavrel::plist
