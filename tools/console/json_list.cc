#include "tools/console/json_list.h"

#include <algorithm>
#include <nlohmann/json.hpp>
#include <ostream>
#include <string>
#include <utility>

namespace tavrel {
namespace {

constexpr std::string_view kElementIndent = "\n    ";
constexpr std::size_t kElementColumns = kElementIndent.size() - 1;

}  // namespace

JsonList::JsonList(std::ostream& out, Json head, std::string_view name, Layout layout)
    : out_(out), layout_(layout) {
  const bool isLine = layout == Layout::Line;
  const std::string object = jsonText(withFormatVersion(std::move(head)), isLine ? -1 : 2);
  const std::string_view open =
      std::string_view(object).substr(0, object.rfind(isLine ? "}" : "\n}"));
  out_ << open << (isLine ? "," : ",\n  ") << Json(name).dump() << (isLine ? ":[" : ": [");
}

void JsonList::add(const Json& element) {
  beginElement();
  if (layout_ == Layout::Line) {
    out_ << jsonText(element, -1);
    return;
  }
  const std::string text = jsonText(element, 2);
  for (std::size_t begin = 0; begin < text.size();) {
    const std::size_t end = std::min(text.find('\n', begin), text.size());
    if (begin > 0) out_ << kElementIndent;
    out_ << std::string_view(text).substr(begin, end - begin);
    begin = end + 1;
  }
}

void JsonList::addText(std::string_view json) {
  beginElement();
  out_ << json;
}

JsonWriter JsonList::elementWriter() const {
  if (layout_ == Layout::Line) return JsonWriter(std::nullopt);
  return JsonWriter(kElementColumns);
}

void JsonList::end() {
  if (layout_ == Layout::Line) {
    out_ << "]}\n";
  } else {
    out_ << (isEmpty_ ? "]\n}\n" : "\n  ]\n}\n");
  }
}

void JsonList::beginElement() {
  if (!std::exchange(isEmpty_, false)) out_ << ',';
  if (layout_ == Layout::Document) out_ << kElementIndent;
}

}  // namespace tavrel
