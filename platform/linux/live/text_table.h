// Kernel texts that are tables: each line is a row, one of its tokens names the row, others are
// figures. diskstats, vmstat, pressure and residencies all have this form.
#pragma once

#include <cstddef>
#include <cstdint>
#include <functional>
#include <span>
#include <string>
#include <string_view>
#include <unordered_map>
#include <vector>

#include "base/keyed_hash.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/live/live_source.h"

namespace tavrel::live {

/// How the lines of a text become rows.
struct TableForm {
  static constexpr std::size_t kNoKey = SIZE_MAX;

  std::size_t key = 0;         // token that names the row; `kNoKey` when all lines are one row
  std::string_view mark = {};  // dropped at the beginning of a line
  std::size_t headings = 0;    // lines before the first row
  char separator = ' ';        // of tokens, besides blanks and ':'
};

/// Returns the key of a line; when that is the first token, moves `line` past it. Empty for empty
/// lines and for headings, which begin with a colon.
std::string_view keyOfLine(std::string_view& line, const TableForm& form);

/// How many tokens remain in a line.
std::size_t tokensIn(std::string_view line, const TableForm& form);

/// A figure of a row. Tokens are counted from 0, the key included.
struct Cell {
  std::size_t token;
  std::uint32_t slot;  // relative to the row's first
  Scale scale = {};
};

/// Reads the rows whose keys were added; figures of rows that share slots add up.
class TableReader final : public TextReader {
 public:
  TableReader(TableForm form, std::vector<Cell> cells) : form_(form), cells_(std::move(cells)) {}

  void addRow(std::string key, std::uint32_t firstSlot);
  void read(std::string_view text, std::span<std::int64_t> slots) const override;

 private:
  TableForm form_;
  std::vector<Cell> cells_;  // of every row, by ascending tokens
  std::unordered_map<std::string, std::uint32_t, KeyedHash, std::equal_to<>> rows_;
};

/// How a figure enters the daily log: not at all, as it is, or added to the fold of that name.
struct Daily {
  std::string_view fold = {};
  LiveSource::Fold how = LiveSource::Fold::Sum;
  bool isItself = false;
};
inline constexpr Daily kNotDaily{};
inline constexpr Daily kItself{.isItself = true};

// -- Tables in which every row is a device ------------------------------------------------------

struct Column {
  std::size_t token;
  std::string_view name;  // the channel is ROW.NAME
  Unit unit;
  Scale scale = {};
  Daily daily = kNotDaily;
};

struct DeviceTable {
  std::string_view path;
  std::string_view group;  // the row is the subgroup
  TableForm form;
  std::span<const Column> columns;
  std::string_view prefix = {};  // of keys that name devices
  std::string_view daily = {};   // folder where a device that counts in daily folds has a "device"
  std::string_view only = {};    // if set, only devices with an entry in this folder are shown
};

void addDeviceTable(const DeviceRoot& root, const DeviceTable& table, LiveSource& source);

// -- Texts with a list of figures to show -------------------------------------------------------

struct Figure {
  std::string_view key;
  std::size_t token;
  std::string_view name;
  Unit unit;
  Scale scale = {};
  Daily daily = kNotDaily;
};

struct FigureList {
  std::string_view group;
  std::string_view subGroup = {};
  std::string_view prefix = {};  // of the names of channels
  std::span<const Figure> figures;
  TableForm form = {};
  ReadMode mode = ReadMode::Once;
};

/// Publishes those figures of the list that the text at `path` contains now.
void addFigures(const std::string& path, const FigureList& list, LiveSource& source);

}  // namespace tavrel::live
