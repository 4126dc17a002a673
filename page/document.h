// A page as one file: head, table of contents, sections. It needs no network and no script, follows
// the reader's light or dark scheme, can be printed, and works at widths from 320 to 1,920 pixels.
//
//   Document document("Device");
//   document.head().element("p", "On 2026-11-25");
//   HtmlWriter& html = document.section("Health");
//   html.element("p", "All is well.");
//   out << document.text();
#pragma once

#include <list>
#include <string>
#include <string_view>

#include "page/html_writer.h"

namespace tavrel::page {

class Document {
 public:
  /// `title` also becomes the page's heading.
  explicit Document(std::string title) : title_(std::move(title)) {}

  /// Content below the heading, before the table of contents.
  HtmlWriter& head() { return head_; }
  /// Begins a section, whose heading also appears in the table of contents. The writer
  /// lives as long as the document.
  HtmlWriter& section(std::string_view title);

  std::string text() const;

 private:
  struct Section {
    std::string title;
    HtmlWriter html;
  };

  std::string title_;
  HtmlWriter head_;
  std::list<Section> sections_;
};

}  // namespace tavrel::page
