// Writes JSON directly as text, for long lists: building and freeing a tree of values takes several
// times as long as writing its text.
//
//   json.beginObject();
//   json.member("name").text(name);
//   json.member("values").beginArray();
//   for (...) json.element().integer(value);
//   json.endArray();
//   json.endObject();
//
// The text is the one that `jsonText` gives for the same values. Names of members are not escaped.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string>
#include <string_view>

namespace tavrel {

class JsonWriter {
 public:
  /// Lines are indented by `indent` spaces, and more as values nest. Without it, all is one line.
  explicit JsonWriter(std::optional<std::size_t> indent) : indent_(indent) {}

  /// What was written; the next value begins a new text after `clear`.
  std::string_view text() const { return text_; }
  void clear() { text_.clear(); }

  void beginObject() { begin('{'); }
  void endObject() { end('}'); }
  void beginArray() { begin('['); }
  void endArray() { end(']'); }

  /// One of the values below, or one of the containers above, follows each.
  JsonWriter& member(std::string_view name);
  JsonWriter& element();

  void null() { text_ += "null"; }
  void boolean(bool value) { text_ += value ? "true" : "false"; }
  void integer(std::int64_t value);
  void integer(std::uint64_t value);
  /// Not-a-number and infinities become null.
  void real(double value);
  /// Malformed UTF-8 is repaired.
  void text(std::string_view value);

 private:
  void begin(char bracket);
  void end(char bracket);
  void lineEnd();

  const std::optional<std::size_t> indent_;
  std::size_t depth_ = 0;
  bool isFirst_ = true;  // of the members or elements of the container that is open
  std::string text_;
};

}  // namespace tavrel
