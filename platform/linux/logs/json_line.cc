#include "platform/linux/logs/json_line.h"

#include <cmath>

#include "base/text.h"
#include "platform/linux/files/stamp.h"

namespace tavrel {

void appendJson(std::string& out, const plist::Value& value) {
  switch (value.kind()) {
    case plist::Kind::Null:
      out += "null";
      break;
    case plist::Kind::Boolean:
      out += value.boolean() == true ? "true" : "false";
      break;
    case plist::Kind::Number: {
      const plist::Number number = *value.number();
      const bool isFinite = !number.isFloating() || std::isfinite(number.real());
      out += isFinite ? numberText(number) : '"' + numberText(number) + '"';
      break;
    }
    case plist::Kind::Date:
      appendQuoted(out, preciseStamp(*value.date()));
      break;
    case plist::Kind::String:
      appendQuoted(out, *value.string());
      break;
    case plist::Kind::Data:
      out += '"';
      appendHex(out, value.data().bytes());
      out += '"';
      break;
    case plist::Kind::Array: {
      const plist::Array array = value.array();
      char separator = '[';
      for (const plist::Value& element : array) {
        out += separator;
        appendJson(out, element);
        separator = ',';
      }
      out += array.empty() ? "[]" : "]";
      break;
    }
    case plist::Kind::Dictionary: {
      const plist::Dictionary dictionary = value.dictionary();
      char separator = '{';
      for (const auto& [key, entry] : dictionary) {
        out += separator;
        appendQuoted(out, key);
        out += ':';
        appendJson(out, entry);
        separator = ',';
      }
      out += dictionary.empty() ? "{}" : "}";
      break;
    }
  }
}

}  // namespace tavrel
