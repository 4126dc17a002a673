// Writes JSON directly as text, for long lists: building and freeing a tree of values
// takes several times as long.
//
//   json.beginObject();
//   json.member("name").text(name);
//   json.member("values").beginArray();
//   for (...) json.element().integer(value);
//   json.endArray();
//   json.endObject();
//
// The text equals that of `jsonText` for the same values. Names of members are not escaped.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tavrel {

class JsonWriter {
 public:
  /// Indents lines by `indent` spaces, and nested values further. Without it, writes one line.
  explicit JsonWriter(std::optional<std::size_t> indent) : indent_(indent) {}

  /// The text written so far; after `clear`, the next value begins a new text.
  std::string_view text() const { return text_; }
  void clear() { text_.clear(); }

  void beginObject() { begin('{'); }
  void endObject() { end('}'); }
  void beginArray() { begin('['); }
  void endArray() { end(']'); }

  /// Each must be followed by one of the values below or one of the containers above.
  JsonWriter& member(std::string_view name);
  JsonWriter& element();

  void null() { text_ += "null"; }
  void boolean(bool value) { text_ += value ? "true" : "false"; }
  void integer(std::int64_t value);
  void integer(std::uint64_t value);
  /// Writes null for not-a-number and infinities.
  void real(double value);
  /// Repairs malformed UTF-8.
  void text(std::string_view value);

 private:
  void begin(char bracket);
  void end(char bracket);
  void lineEnd();

  const std::optional<std::size_t> indent_;
  std::size_t depth_ = 0;
  bool isFirst_ = true;  // in the innermost open container
  std::string text_;
};

}  // namespace tavrel
