// Writes HTML and SVG as text. Outside data cannot become markup.
//
//   HtmlWriter html;
//   html.begin("p", {{"class", "note"}});
//   html.text(anything);
//   html.end();
//   html.element("td", anything);
//
// Names of elements and attributes are literals of the program and are written as they are; texts
// and attribute values are escaped. Malformed UTF-8 is repaired. Characters that HTML does not
// allow, and invisible ones that would reorder text, are replaced with visible ones.
#pragma once

#include <initializer_list>
#include <string>
#include <string_view>
#include <vector>

namespace tavrel::page {

/// Borrows both texts. An attribute with an empty value is left out.
struct Attribute {
  std::string_view name;
  std::string_view value;
};
using Attributes = std::initializer_list<Attribute>;

class HtmlWriter {
 public:
  void begin(const char* element, Attributes attributes = {});
  /// Ends the innermost open element.
  void end();

  void text(std::string_view text);
  /// Writes a name from outside, such as a key: its direction does not affect the text around it,
  /// and long ones wrap, preferably at dots.
  void name(std::string_view name);
  /// Writes an element that holds only text.
  void element(const char* element, std::string_view text, Attributes attributes = {});
  /// Writes an element without content: in HTML one that has no end tag, in SVG any.
  void empty(const char* element, Attributes attributes = {});

  /// Appends the whole output of another writer.
  void append(const HtmlWriter& other) { out_ += other.out_; }

  /// Everything written so far. All elements must have been ended.
  std::string_view written() const { return out_; }

 private:
  void tag(const char* element, Attributes attributes, std::string_view end);

  std::string out_;
  std::vector<const char*> open_;
};

}  // namespace tavrel::page
