// Charts as inline SVG, with their texts as HTML around it, so that texts keep their size at any
// width. Each chart has an accessible name that also states the figures a reader would look for
// first. Values that are not finite count as missing.
#pragma once

#include <functional>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "page/html_writer.h"

namespace tavrel::page {

/// Values over days. The line has gaps where data is missing; a value between gaps is a dot.
struct LineChart {
  std::string name;  // accessible
  /// One per day. Only their differences matter, so that they may count from any value.
  std::vector<std::optional<double>> values;
  /// A band around the line, such as the extremes of each day: for the same days, or empty.
  std::vector<std::optional<double>> lows = {};
  std::vector<std::optional<double>> highs = {};
  std::string first;  // labels of the first and the last day
  std::string last;
  /// Labels of the extremes, including those of the band. When both are the same, the line is flat.
  std::string lowest;
  std::string highest;
  std::string latest;  // the text of the last value
};
void writeLineChart(HtmlWriter& html, const LineChart& chart);

/// Columns over adjacent intervals.
struct Histogram {
  std::string name;
  struct Cell {
    std::string label;  // "(10, 20]"
    double count = 0;
  };
  std::vector<Cell> cells;
  std::string lowest;  // labels of the two ends
  std::string highest;
};
void writeHistogram(HtmlWriter& html, const Histogram& histogram);

/// Labelled bars, one per row; also for histograms whose intervals differ in width.
struct Bar {
  std::string label;
  double value = 0;  // negative values have no bar
  std::string text;
};
void writeBars(HtmlWriter& html, std::string_view name, std::span<const Bar> bars);

/// Parts of a whole in one bar, with a legend.
struct Share {
  std::string label;
  double share = 0;  // a fraction of 1
  std::string text;  // after the share in the legend; may be empty
};
void writeShares(HtmlWriter& html, std::string_view name, std::span<const Share> shares);

/// Estimates with their intervals on a common scale, one per row, with a line at `reference`.
struct IntervalChart {
  std::string name;
  struct Row {
    std::string label;
    double lower = 0, estimate = 0, upper = 0;
    std::string text;        // the figures of the row
    bool isNotable = false;  // drawn in the colour of notable rows
  };
  std::vector<Row> rows;
  double reference = 0;
  /// Writes the numbers of the scale; page/number_text.h has the usual ways.
  std::function<std::string(double value)> text;
};
void writeIntervals(HtmlWriter& html, const IntervalChart& chart);

}  // namespace tavrel::page
