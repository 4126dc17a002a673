#include "tools/console/value_text.h"

#include <ostream>

#include "base/format.h"
#include "base/text.h"
#include "tools/console/sorted_entries.h"
#include "tools/console/table.h"

namespace tavrel {
namespace {

using plist::Kind;

bool isFilledContainer(const plist::Value& value) {
  return !value.array().empty() || !value.dictionary().empty();
}

void printMember(std::ostream& out, std::string_view name, const plist::Value& value,
                 std::size_t indent) {
  out << std::string(indent, ' ') << name;
  if (isFilledContainer(value)) {
    out << ":\n";
    printOutline(out, value, indent + 2);
  } else {
    out << " = " << printable(inlineText(value)) << '\n';
  }
}

}  // namespace

std::string_view kindName(const plist::Value& value) {
  switch (value.kind()) {
    case Kind::Boolean:
      return "boolean";
    case Kind::Number:
      return value.number()->isFloating() ? "real" : "integer";
    case Kind::Date:
      return "date";
    case Kind::String:
      return "string";
    case Kind::Data:
      return "data";
    case Kind::Array:
      return "array";
    case Kind::Dictionary:
      return "dictionary";
    case Kind::Null:
      break;
  }
  return "null";
}

std::string kindWithArticle(const plist::Value& value) {
  const std::string_view name = kindName(value);
  const bool vowel = name.starts_with('i') || name.starts_with('a');
  return (vowel ? "an " : "a ") + std::string(name);
}

std::string inlineText(const plist::Value& value) {
  std::string text;
  if (const auto boolean = value.boolean()) return *boolean ? "true" : "false";
  if (const auto string = value.string()) {
    appendQuoted(text, *string);
    return text;
  }
  if (const auto array = value.array()) {
    for (const plist::Value& element : array)
      text += (text.empty() ? "" : ", ") + inlineText(element);
    return '[' + text + ']';
  }
  if (const auto dictionary = value.dictionary()) {
    for (const plist::Entry* entry : sortedEntries(dictionary)) {
      if (!text.empty()) text += ", ";
      appendQuoted(text, entry->key);
      text += ": " + inlineText(entry->value);
    }
    return '{' + text + '}';
  }
  text = textOf(value);
  if (const auto number = value.number(); number && number->isFloating()) {
    const bool looksLikeInteger = text.find_first_not_of("-0123456789") == std::string::npos;
    if (looksLikeInteger) text += ".0";
  }
  return text;
}

void printOutline(std::ostream& out, const plist::Value& value, std::size_t indent) {
  if (!isFilledContainer(value)) {
    out << std::string(indent, ' ') << printable(inlineText(value)) << '\n';
    return;
  }
  if (const auto array = value.array()) {
    std::size_t index = 0;
    for (const plist::Value& element : array) {
      printMember(out, '[' + std::to_string(index++) + ']', element, indent);
    }
    return;
  }
  const auto dictionary = value.dictionary();
  for (const plist::Entry* entry : sortedEntries(dictionary))
    printMember(out, printable(entry->key), entry->value, indent);
}

std::string shortNumber(double value) {
  constexpr std::size_t kPlainDigits = 10;
  const std::string exact = numberText(value);
  return exact.size() <= kPlainDigits ? exact : format("%.9g", value);
}

}  // namespace tavrel
