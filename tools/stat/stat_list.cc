#include "tools/stat/stat_list.h"

#include <algorithm>
#include <charconv>
#include <string_view>
#include <vector>

#include "base/utf8.h"
#include "tools/console/day_argument.h"
#include "tools/console/json_writer.h"
#include "tools/console/table.h"
#include "tools/stat/line_writer.h"
#include "tools/stat/recorded.h"

namespace tavrel {
namespace {

// Rows that are held back to measure columns. The widths of a longer list fit any row.
constexpr std::size_t kRowsMeasured = 1024;
constexpr std::size_t kBytesMeasured = 256U << 10;

constexpr std::string_view kNumbers = "-9223372036854775808";
constexpr std::string_view kDistribution = "distribution";

// One statistic on one day: the value of a scalar, or the number of values of a distribution.
struct Row {
  bool isScalar;
  std::int32_t day;
  std::int64_t number;
  std::string_view key;
};

// Caches the date of a day, because the rows of one day follow each other.
class DayTexts {
 public:
  const std::string& date(std::int32_t day) {
    if (date_.empty() || day != day_) {
      day_ = day;
      date_ = dayDateText(day);
      text_ = dayText(day);
    }
    return date_;
  }
  const std::string& text(std::int32_t day) {
    date(day);
    return text_;
  }

 private:
  std::int32_t day_ = 0;
  std::string date_;
  std::string text_;
};

void appendNumber(std::string& out, std::int64_t number) {
  char digits[24];
  const auto [end, error] = std::to_chars(digits, digits + sizeof digits, number);
  out.append(digits, end);
}

// Writes the table. The key is the last column, so that a long one does not shift others.
class TableWriter {
 public:
  TableWriter(LineWriter& lines, std::optional<std::size_t> columns, std::size_t widestDay)
      : lines_(lines), columns_(columns), widestDay_(widestDay) {}

  void add(const Row& row) {
    if (isMeasured_) return write(row);
    if (keys_.size() + row.key.size() > kBytesMeasured || rows_.size() == kRowsMeasured) {
      widths_ = {widestDay_, kDistribution.size(), kNumbers.size()};
      writeMeasured();
      return write(row);
    }
    keys_ += row.key;
    rows_.push_back(row);
    rows_.back().key = std::string_view(nullptr, 0);
    keySizes_.push_back(row.key.size());
    measure(row);
  }

  /// False when there were no rows.
  bool finish() {
    if (!isMeasured_ && !rows_.empty()) writeMeasured();
    return isMeasured_;
  }

 private:
  struct Widths {
    std::size_t day = std::string_view("DAY").size();
    std::size_t kind = std::string_view("KIND").size();
    std::size_t value = std::string_view("VALUE").size();
  };

  static std::string_view kindOf(const Row& row) {
    return row.isScalar ? std::string_view("scalar") : kDistribution;
  }

  // The text of the value column.
  static void appendValue(std::string& out, const Row& row) {
    appendNumber(out, row.number);
    if (!row.isScalar) out += row.number == 1 ? " value" : " values";
  }

  void measure(const Row& row) {
    std::string value;
    appendValue(value, row);
    widths_.day = std::max(widths_.day, days_.text(row.day).size());
    widths_.kind = std::max(widths_.kind, kindOf(row).size());
    widths_.value = std::max(widths_.value, value.size());
  }

  void writeMeasured() {
    isMeasured_ = true;
    writeLine("DAY", "KIND", "VALUE", "KEY");
    std::size_t start = 0;
    for (std::size_t i = 0; i < rows_.size(); ++i) {
      Row row = rows_[i];
      row.key = std::string_view(keys_).substr(start, keySizes_[i]);
      start += keySizes_[i];
      write(row);
    }
    rows_ = {};
    keys_ = {};
    keySizes_ = {};
  }

  void write(const Row& row) {
    value_.clear();
    appendValue(value_, row);
    writeLine(days_.text(row.day), kindOf(row), value_, row.key);
  }

  void writeLine(std::string_view day, std::string_view kind, std::string_view value,
                 std::string_view key) {
    std::string& out = lines_.buffer();
    const auto pad = [&](std::size_t width, std::string_view text) {
      if (width > text.size()) out.append(width - text.size(), ' ');
    };
    out += day;
    pad(widths_.day + 2, day);
    out += kind;
    pad(widths_.kind + 2, kind);
    pad(widths_.value, value);
    out += value;
    out += "  ";
    appendKey(out, key);
    out += '\n';
  }

  void appendKey(std::string& out, std::string_view key) const {
    constexpr std::size_t kNarrowestKey = 8;
    const std::size_t taken = widths_.day + widths_.kind + widths_.value + 6;
    const std::size_t room =
        columns_ ? std::max(*columns_ - std::min(*columns_, taken), kNarrowestKey) : key.size() * 4;
    const std::string escaped =
        std::ranges::all_of(key, isPrintableAscii) ? std::string() : printable(key);
    const std::string_view shown = escaped.empty() ? key : std::string_view(escaped);
    if (!columns_ || displayWidth(shown) <= room) {
      out += shown;
      return;
    }
    std::string_view rest = shown;
    for (std::size_t width = room - 1; width > 0; --width)
      takeCodePoint(rest);
    out += shown.substr(0, shown.size() - rest.size());
    out += "…";
  }

  LineWriter& lines_;
  const std::optional<std::size_t> columns_;
  const std::size_t widestDay_;
  DayTexts days_;
  Widths widths_;
  bool isMeasured_ = false;
  std::vector<Row> rows_;  // held until measured; `keys_` has their keys
  std::vector<std::size_t> keySizes_;
  std::string keys_;
  std::string value_;
};

// Passes each row to `add`, scalars first, and calls `between` after the last scalar.
template <class Add, class Between>
Status walk(RecordedHistory& history, LineWriter& lines, Add add, Between between) {
  bool goesOn = true;
  Status walked = history.walkScalars(
      [&](std::string_view key, std::int32_t day, std::int64_t value, bool& stop) {
        add(Row{true, day, value, key});
        goesOn = lines.flushIfLarge();
        stop = !goesOn;
      });
  between();
  if (!walked || !goesOn) return walked;
  return history.walkDistributions([&](std::string_view key, std::int32_t day, std::int64_t count,
                                       BHHistoryDistributionEnumerator&, bool& stop) {
    add(Row{false, day, count, key});
    stop = !lines.flushIfLarge();
  });
}

Status printTable(ToolContext& context, RecordedHistory& history) {
  const auto span = history.daysHeld();
  if (!span) return span.error();
  std::size_t widestDay = 0;
  if (*span) {
    widestDay = std::max(dayText((*span)->first).size(), dayText((*span)->last).size());
  }
  LineWriter lines(context.out());
  TableWriter table(lines, context.columns(), widestDay);
  const Status walked = walk(
      history, lines, [&](const Row& row) { table.add(row); }, [] {});
  // When something could not be read, a message has already said so.
  const bool isWhole = walked && context.exitStatus() == kExitSuccess;
  if (!table.finish() && isWhole) lines.buffer() += "no statistics\n";
  return walked;
}

Status printJson(ToolContext& context, RecordedHistory& history) {
  LineWriter lines(context.out());
  DayTexts days;
  JsonWriter json(0);
  json.beginObject();
  json.member("format_version").integer(std::int64_t{kJsonFormatVersion});
  json.member("scalars").beginArray();
  const Status walked = walk(
      history, lines,
      [&](const Row& row) {
        json.element().beginObject();
        json.member("key").text(row.key);
        json.member("day").integer(std::int64_t{row.day});
        json.member("date").text(days.date(row.day));
        json.member(row.isScalar ? "value" : "count").integer(row.number);
        json.endObject();
        lines.buffer() += json.text();
        json.clear();
      },
      [&] {
        json.endArray();
        json.member("distributions").beginArray();
      });
  json.endArray();
  json.endObject();
  lines.buffer().append(json.text()) += '\n';
  return walked;
}

}  // namespace

void listStatistics(ToolContext& context, const std::string& prefix,
                    std::optional<std::int32_t> day) {
  auto history = openRecorded(context, {.key = prefix,
                                        .firstDay = day.value_or(kFirstDay),
                                        .lastDay = day.value_or(kLastDay),
                                        .hasValues = false});
  if (!history) return context.fail(history.error().message);
  const Status listed =
      context.json() ? printJson(context, *history) : printTable(context, *history);
  if (!listed) context.fail(listed.error().message);
}

}  // namespace tavrel
