#include "tools/console/json_writer.h"

#include <algorithm>
#include <charconv>
#include <nlohmann/json.hpp>

#include "base/utf8.h"
#include "tools/console/tool_output.h"

namespace tavrel {
namespace {

constexpr std::size_t kIndentOfLevel = 2;

bool isPlain(char character) {
  return isPrintableAscii(character) && character != '"' && character != '\\';
}

template <class Integer>
void append(std::string& text, Integer value) {
  char digits[24];
  text.append(digits, std::to_chars(digits, digits + sizeof digits, value).ptr);
}

}  // namespace

JsonWriter& JsonWriter::element() {
  if (!isFirst_) text_ += ',';
  isFirst_ = false;
  lineEnd();
  return *this;
}

JsonWriter& JsonWriter::member(std::string_view name) {
  element();
  text_ += '"';
  text_ += name;
  text_ += indent_ ? "\": " : "\":";
  return *this;
}

void JsonWriter::integer(std::int64_t value) {
  append(text_, value);
}

void JsonWriter::integer(std::uint64_t value) {
  append(text_, value);
}

void JsonWriter::real(double value) {
  text_ += jsonText(value, -1);
}

void JsonWriter::text(std::string_view value) {
  if (!std::ranges::all_of(value, isPlain)) {
    text_ += jsonText(value, -1);
    return;
  }
  text_ += '"';
  text_ += value;
  text_ += '"';
}

void JsonWriter::begin(char bracket) {
  text_ += bracket;
  ++depth_;
  isFirst_ = true;
}

void JsonWriter::end(char bracket) {
  --depth_;
  if (!isFirst_) lineEnd();
  isFirst_ = false;
  text_ += bracket;
}

void JsonWriter::lineEnd() {
  if (!indent_) return;
  text_ += '\n';
  text_.append(*indent_ + depth_ * kIndentOfLevel, ' ');
}

}  // namespace tavrel
