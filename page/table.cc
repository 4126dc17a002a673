#include "page/table.h"

namespace tavrel::page {

Table::Table(HtmlWriter& html, std::string_view name, std::vector<Column> columns)
    : html_(html), columns_(std::move(columns)) {
  html_.begin("table", {{"aria-label", name}});
  html_.begin("thead");
  html_.begin("tr");
  for (const Column& column : columns_) {
    if (column.align == Align::Number) {
      html_.element("th", column.title, {{"scope", "col"}, {"class", "number"}});
    } else {
      html_.element("th", column.title, {{"scope", "col"}});
    }
  }
  html_.end();
  html_.end();
  html_.begin("tbody");
}

void Table::row() {
  if (hasRow_) html_.end();
  html_.begin("tr");
  hasRow_ = true;
  next_ = 0;
}

// On a narrow page, the column's title appears beside the cell.
void Table::beginCell() {
  const Column& column = columns_.at(next_++);
  if (column.align == Align::Name) {
    html_.begin("th", {{"scope", "row"}});
  } else if (column.align == Align::Number) {
    html_.begin("td", {{"class", "number"}, {"data-title", column.title}});
  } else if (column.align == Align::Plain) {
    html_.begin("td");
  } else {
    html_.begin("td", {{"data-title", column.title}});
  }
}

void Table::cell(std::string_view text) {
  beginCell();
  html_.text(text);
  html_.end();
}

void Table::cell(const std::function<void(HtmlWriter& html)>& write) {
  beginCell();
  write(html_);
  html_.end();
}

void Table::end() {
  if (hasRow_) html_.end();
  html_.end();
  html_.end();
}

}  // namespace tavrel::page
