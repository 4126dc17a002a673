#include "page/document.h"

#include "base/format.h"
#include "page/style.h"

namespace tavrel::page {
namespace {

// If text ever became markup, it could neither run nor load anything.
constexpr std::string_view kHead =
    "<!DOCTYPE html>\n<html lang=\"en\"><head><meta charset=\"utf-8\">"
    "<meta http-equiv=\"Content-Security-Policy\" "
    "content=\"default-src 'none'; style-src 'unsafe-inline'\">"
    "<meta name=\"viewport\" content=\"width=device-width, initial-scale=1\">"
    "<meta name=\"color-scheme\" content=\"light dark\">";

}  // namespace

HtmlWriter& Document::section(std::string_view title) {
  sections_.push_back({std::string(title), {}});
  return sections_.back().html;
}

std::string Document::text() const {
  HtmlWriter html;
  html.element("title", title_);
  html.begin("style");
  std::string text(kHead);
  text += html.written();
  text += kStyle;
  text += "</style></head>\n";

  HtmlWriter body;
  body.begin("body");
  body.begin("header");
  body.begin("h1");
  body.name(title_);
  body.end();
  body.append(head_);
  body.end();
  body.begin("nav", {{"aria-label", "Contents"}});
  body.begin("ol");
  std::size_t number = 0;
  for (const Section& section : sections_) {
    body.begin("li");
    body.element("a", section.title, {{"href", format("#s%zu", ++number)}});
    body.end();
  }
  body.end();
  body.end();
  body.begin("main");
  number = 0;
  for (const Section& section : sections_) {
    const std::string id = format("s%zu", ++number);
    body.begin("section", {{"aria-labelledby", id}});
    body.element("h2", section.title, {{"id", id}});
    body.append(section.html);
    body.end();
  }
  body.end();
  body.end();
  text += body.written();
  return text + "</html>\n";
}

}  // namespace tavrel::page
