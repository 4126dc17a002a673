#include "platform/linux/live/text_table.h"

#include <algorithm>
#include <memory>
#include <tuple>
#include <unordered_set>
#include <utility>

#include "base/ascii.h"
#include "base/format.h"
#include "base/limits.h"

namespace tavrel::live {
namespace {

void skipHeadings(std::string_view& text, const TableForm& form) {
  for (std::size_t i = 0; i < form.headings; ++i)
    takeLine(text);
}

/// Calls back with the key and the number of tokens of each row.
template <class Callback>
void forEachRow(std::string_view text, const TableForm& form, const Callback& callback) {
  skipHeadings(text, form);
  while (!text.empty()) {
    const std::string_view line = takeLine(text);
    std::string_view rest = line;
    const std::string_view key = keyOfLine(rest, form);
    if (key.empty() && form.key != TableForm::kNoKey) continue;
    callback(key, tokensIn(line, form));
  }
}

// The name of a row's folder: sysfs writes '/' in names as '!'.
std::string entryName(std::string name) {
  std::replace(name.begin(), name.end(), '/', '!');
  return name;
}

void publish(const Place& place, std::string name, std::uint32_t slot, const Daily& daily,
             LiveSource& source) {
  source.addSimple(place, std::move(name), slot, daily.isItself ? kDailyCategory : kToolCategory);
  if (!daily.fold.empty()) source.addToFold(daily.fold, place.unit, daily.how, slot);
}

struct DeviceRow {
  std::string key;
  std::size_t tokens;
};

struct DeviceRows {
  std::vector<DeviceRow> rows;
  bool isCut = false;  // whether there were more
};

/// The rows that name devices to show, each name once.
DeviceRows deviceRows(std::string_view text, const DeviceRoot& root, const DeviceTable& table,
                      LiveSource& source) {
  std::unordered_set<std::string> allowed;
  if (!table.only.empty()) {
    for (std::string& name : source.namesIn(root.path(table.only)))
      allowed.insert(std::move(name));
  }
  DeviceRows found;
  std::unordered_set<std::string> seen;
  forEachRow(text, table.form, [&](std::string_view key, std::size_t tokens) {
    if (!key.starts_with(table.prefix)) return;
    if (found.rows.size() == limits::kLiveRows) {
      found.isCut = true;
      return;
    }
    if (!table.prefix.empty() && key == table.prefix) return;  // the sum of all
    std::string name(key);
    if (!table.only.empty() && !allowed.contains(entryName(name))) return;
    if (seen.insert(name).second) found.rows.push_back({std::move(name), tokens});
  });
  return found;
}

/// Each row has a slot for each column.
std::unique_ptr<TableReader> readerOf(const std::vector<DeviceRow>& rows,
                                      const DeviceTable& table) {
  std::vector<Cell> cells;
  for (const Column& column : table.columns)
    cells.push_back({column.token, static_cast<std::uint32_t>(cells.size()), column.scale});
  const auto width = static_cast<std::uint32_t>(cells.size());
  auto reader = std::make_unique<TableReader>(table.form, std::move(cells));
  for (std::size_t i = 0; i < rows.size(); ++i)
    reader->addRow(rows[i].key, static_cast<std::uint32_t>(i) * width);
  return reader;
}

using CellKind = std::pair<std::size_t, Scale>;  // token and scale

bool isBefore(const CellKind& a, const CellKind& b) {
  return std::tuple(a.first, a.second.multiply, a.second.divide) <
         std::tuple(b.first, b.second.multiply, b.second.divide);
}

/// Each token and scale of the figures once, in order.
std::vector<CellKind> cellKindsOf(std::span<const Figure> figures) {
  std::vector<CellKind> kinds;
  for (const Figure& figure : figures)
    kinds.emplace_back(figure.token, figure.scale);
  std::sort(kinds.begin(), kinds.end(), isBefore);
  const auto isSame = [](const CellKind& a, const CellKind& b) { return !isBefore(a, b); };
  kinds.erase(std::unique(kinds.begin(), kinds.end(), isSame), kinds.end());
  return kinds;
}

}  // namespace

std::string_view keyOfLine(std::string_view& line, const TableForm& form) {
  const std::size_t start = line.find_first_not_of(" \t");
  if (start == std::string_view::npos) return {};
  line.remove_prefix(start);
  if (!form.mark.empty() && line.starts_with(form.mark)) {
    line.remove_prefix(form.mark.size());
  } else if (line.front() == ':') {
    return {};
  }
  if (form.key == TableForm::kNoKey) return {};
  if (form.key == 0) return takeToken(line, form.separator);
  std::string_view ahead = line;
  std::string_view key;
  for (std::size_t i = 0; i <= form.key; ++i)
    key = takeToken(ahead, form.separator);
  return key;
}

std::size_t tokensIn(std::string_view line, const TableForm& form) {
  std::size_t count = 0;
  while (!takeToken(line, form.separator).empty())
    ++count;
  return count;
}

void TableReader::addRow(std::string key, std::uint32_t firstSlot) {
  rows_.emplace(std::move(key), firstSlot);
}

void TableReader::read(std::string_view text, std::span<std::int64_t> slots) const {
  skipHeadings(text, form_);
  while (!text.empty()) {
    std::string_view line = takeLine(text);
    const std::string_view key = keyOfLine(line, form_);
    const bool isKeyless = form_.key == TableForm::kNoKey;
    if (key.empty() && !isKeyless) continue;
    const auto row = rows_.find(key);
    if (row == rows_.end()) continue;
    std::size_t next = form_.key == 0 ? 1 : 0;
    std::string_view token;
    for (const Cell& cell : cells_) {
      while (next <= cell.token) {
        token = takeToken(line, form_.separator);
        if (token.empty()) break;
        ++next;
      }
      if (token.empty()) break;
      const std::size_t slot = std::size_t{row->second} + cell.slot;
      const std::int64_t value = scaledNumber(token, cell.scale);
      if (slot >= slots.size() || value == kUnset) continue;
      slots[slot] = slots[slot] == kUnset ? value : saturatingSum(slots[slot], value);
    }
  }
}

void addDeviceTable(const DeviceRoot& root, const DeviceTable& table, LiveSource& source) {
  TextBuffer buffer;
  std::string path = root.path(table.path);
  const auto text = readKernelFile(path, ReadMode::ToEnd, buffer);
  if (!text) return;
  const DeviceRows found = deviceRows(*text, root, table, source);
  if (found.isCut || buffer.isCut()) {
    source.note(format("%s: only the first %zu rows are shown", path, found.rows.size()));
  }
  const auto slots = static_cast<std::uint32_t>(found.rows.size() * table.columns.size());
  std::uint32_t slot =
      source.addTextFile(std::move(path), slots, readerOf(found.rows, table), ReadMode::ToEnd);
  for (const DeviceRow& row : found.rows) {
    const std::string device = channelName(row.key);
    const bool isDaily =
        !table.daily.empty() &&
        isOwnDevice(root.path(std::string(table.daily) + '/' + entryName(row.key)));
    for (const Column& column : table.columns) {
      const std::uint32_t at = slot++;
      // Older kernels have fewer columns.
      if (column.token >= row.tokens) continue;
      publish({table.group, device, column.unit}, device + '.' + std::string(column.name), at,
              isDaily || table.daily.empty() ? column.daily : kNotDaily, source);
    }
  }
}

void addFigures(const std::string& path, const FigureList& list, LiveSource& source) {
  TextBuffer buffer;
  const auto text = readKernelFile(path, list.mode, buffer);
  if (!text) return;
  const bool isKeyless = list.form.key == TableForm::kNoKey;
  std::unordered_map<std::string, std::size_t> tokens;
  forEachRow(*text, list.form,
             [&](std::string_view key, std::size_t count) { tokens.emplace(key, count); });
  // Rows may have different figures, so the table has a column for each listed token and scale.
  const std::vector<CellKind> columns = cellKindsOf(list.figures);
  std::vector<Cell> cells;
  cells.reserve(columns.size());
  for (const auto& [token, scale] : columns)
    cells.push_back({token, static_cast<std::uint32_t>(cells.size()), scale});
  const auto width = static_cast<std::uint32_t>(cells.size());

  auto reader = std::make_unique<TableReader>(list.form, std::move(cells));
  std::unordered_map<std::string_view, std::uint32_t> firstSlots;
  std::vector<std::pair<const Figure*, std::uint32_t>> found;
  for (const Figure& figure : list.figures) {
    const auto row = tokens.find(std::string(isKeyless ? std::string_view() : figure.key));
    if (row == tokens.end() || figure.token >= row->second) continue;
    const auto [at, isNew] =
        firstSlots.emplace(figure.key, static_cast<std::uint32_t>(firstSlots.size()) * width);
    if (isNew) reader->addRow(row->first, at->second);
    const auto column = std::lower_bound(columns.begin(), columns.end(),
                                         CellKind(figure.token, figure.scale), isBefore);
    found.emplace_back(&figure, at->second + static_cast<std::uint32_t>(column - columns.begin()));
  }
  if (found.empty()) return;
  const std::uint32_t first = source.addTextFile(
      path, static_cast<std::uint32_t>(firstSlots.size()) * width, std::move(reader), list.mode);
  for (const auto& [figure, slot] : found) {
    publish({list.group, list.subGroup, figure->unit},
            std::string(list.prefix) + std::string(figure->name), first + slot, figure->daily,
            source);
  }
}

}  // namespace tavrel::live
