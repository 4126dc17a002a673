// Tables that become a list of cards where the page is narrow.
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
  /// Names head their row; numbers stand flush right; plain texts speak for themselves and need no
  /// title beside them on a card.
  enum class Align : std::uint8_t { Text, Number, Name, Plain };
  struct Column {
    std::string title;
    Align align = Align::Text;
  };

  /// `name` is the accessible name. The writer must outlive the table.
  Table(HtmlWriter& html, std::string_view name, std::vector<Column> columns);

  void row();
  /// The next cell of the row.
  void cell(std::string_view text);
  /// A cell whose content `write` writes.
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
