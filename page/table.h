// Tables that turn into a list of cards on a narrow page.
//
//   Table table(html, "Drives", {{"Drive"}, {"Written", Table::Align::Number}});
//   table.row();
//   table.cell("nvme0");
//   table.cell("1.5 TiB");
//   table.end();
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "page/html_writer.h"

namespace tavrel::page {

class Table {
 public:
  /// Names are row headings; numbers are right-aligned; plain texts are self-explanatory and need
  /// no title beside them on a card.
  enum class Align : std::uint8_t { Text, Number, Name, Plain };
  struct Column {
    std::string title;
    Align align = Align::Text;
  };

  /// `name` is the accessible name. The writer must outlive the table.
  Table(HtmlWriter& html, std::string_view name, std::vector<Column> columns);

  void row();
  /// Writes the next cell of the row.
  void cell(std::string_view text);
  /// Writes a cell whose content `write` produces.
  void cell(const std::function<void(HtmlWriter& html)>& write);
  void end();

 private:
  void beginCell();

  HtmlWriter& html_;
  std::vector<Column> columns_;
  std::size_t next_ = 0;  // column
  bool hasRow_ = false;
};

}  // namespace tavrel::page
