#include "page/html_writer.h"

#include "base/utf8.h"

namespace tavrel::page {
namespace {

// Whether a byte can be copied as it is, both in text and in quoted values.
bool isPlain(char character) {
  return isPrintableAscii(character) && character != '<' && character != '>' && character != '&' &&
         character != '"';
}

// A document may not contain noncharacters, or controls other than line ends and tabs.
char32_t shown(char32_t point) {
  constexpr char32_t kControlPictures = 0x2400;
  constexpr char32_t kDeletePicture = 0x2421;
  if (point == '\n' || point == '\t') return point;
  if (point < ' ') return kControlPictures + point;
  if (point == 0x7F) return kDeletePicture;
  const bool isControl = point > 0x7F && point < 0xA0;
  const bool isNoncharacter = (point & 0xFFFE) == 0xFFFE || (point >= 0xFDD0 && point <= 0xFDEF);
  const bool isReplaced = isControl || isNoncharacter || changesDirection(point);
  return isReplaced ? kReplacementCharacter : point;
}

void appendEscaped(std::string& out, std::string_view text) {
  while (!text.empty()) {
    std::size_t plain = 0;
    while (plain < text.size() && isPlain(text[plain]))
      ++plain;
    out += text.substr(0, plain);
    text.remove_prefix(plain);
    if (text.empty()) return;
    switch (const char32_t point = takeCodePoint(text)) {
      case '<':
        out += "&lt;";
        break;
      case '>':
        out += "&gt;";
        break;
      case '&':
        out += "&amp;";
        break;
      case '"':
        out += "&quot;";
        break;
      default:
        appendCodePoint(out, shown(point));
    }
  }
}

}  // namespace

void HtmlWriter::tag(const char* element, Attributes attributes, std::string_view end) {
  out_ += '<';
  out_ += element;
  for (const Attribute& attribute : attributes) {
    if (attribute.value.empty()) continue;
    out_ += ' ';
    out_ += attribute.name;
    out_ += "=\"";
    appendEscaped(out_, attribute.value);
    out_ += '"';
  }
  out_ += end;
}

void HtmlWriter::begin(const char* element, Attributes attributes) {
  tag(element, attributes, ">");
  open_.push_back(element);
}

void HtmlWriter::end() {
  out_ += "</";
  out_ += open_.back();
  out_ += '>';
  open_.pop_back();
}

void HtmlWriter::text(std::string_view text) {
  appendEscaped(out_, text);
}

void HtmlWriter::name(std::string_view name) {
  out_ += "<bdi>";
  while (!name.empty()) {
    const std::size_t part = std::min(name.find('.'), name.size() - 1) + 1;
    appendEscaped(out_, name.substr(0, part));
    name.remove_prefix(part);
    if (!name.empty()) out_ += "<wbr>";
  }
  out_ += "</bdi>";
}

void HtmlWriter::element(const char* element, std::string_view text, Attributes attributes) {
  begin(element, attributes);
  appendEscaped(out_, text);
  end();
}

void HtmlWriter::empty(const char* element, Attributes attributes) {
  tag(element, attributes, "/>");
}

}  // namespace tavrel::page
