// Writes HTML and SVG as text. What comes from outside cannot become markup.
//
//   HtmlWriter html;
//   html.begin("p", {{"class", "note"}});
//   html.text(anything);
//   html.end();
//   html.element("td", anything);
//
// Names of elements and attributes are literals of the program and written as they are; texts and
// values of attributes are escaped. Malformed UTF-8 is repaired. Characters that HTML does not
// allow, and invisible ones that would show text in another order, become visible ones.
#pragma once

#include <initializer_list>
#include <string>
#include <string_view>
#include <vector>

namespace tavrel::page {

/// Borrows both. An attribute without a value is left out.
struct Attribute {
  std::string_view name;
  std::string_view value;
};
using Attributes = std::initializer_list<Attribute>;

class HtmlWriter {
 public:
  void begin(const char* element, Attributes attributes = {});
  /// Ends the element that was begun last.
  void end();

  void text(std::string_view text);
  /// A name from outside, such as a key: its direction does not affect the text around it, and long
  /// ones wrap, at dots first.
  void name(std::string_view name);
  /// An element that holds only text.
  void element(const char* element, std::string_view text, Attributes attributes = {});
  /// An element without content: of HTML one that has no end tag, of SVG any.
  void empty(const char* element, Attributes attributes = {});

  /// What another writer wrote whole.
  void append(const HtmlWriter& other) { out_ += other.out_; }

  /// All that was written. Elements that were begun must have been ended.
  std::string_view written() const { return out_; }

 private:
  void tag(const char* element, Attributes attributes, std::string_view end);

  std::string out_;
  std::vector<const char*> open_;
};

}  // namespace tavrel::page
