// A JSON object whose last member is a list, printed element by element, so that
// long lists take no memory.
//
//   JsonList list(context.out(), {{"sample", 1}}, "channels");
//   for (...) list.add({{"name", ...}});
//   list.end();
#pragma once

#include <cstdint>
#include <iosfwd>
#include <string_view>

#include "tools/console/json_writer.h"
#include "tools/console/tool_output.h"

namespace tavrel {

class JsonList {
 public:
  /// Indented like other documents, or a single line.
  enum class Layout : std::uint8_t { Document, Line };

  /// Prints "format_version" and the members of `head`, then begins the list `name`.
  JsonList(std::ostream& out, Json head, std::string_view name, Layout layout = Layout::Document);

  void add(const Json& element);
  /// Adds an element that is already JSON; it is printed unchanged.
  void addText(std::string_view json);
  /// A writer of elements for `addText`, with the indentation that they need in the list.
  JsonWriter elementWriter() const;
  /// Ends the list, the object and its line.
  void end();

 private:
  void beginElement();

  std::ostream& out_;
  const Layout layout_;
  bool isEmpty_ = true;
};

}  // namespace tavrel
