// Charts as inline SVG with their texts as HTML around it, so that texts keep their size at any
// width. Each chart has an accessible name, which also tells the figures that the eye would look
// for first. Values that are not finite count as no data.
#pragma once

#include <functional>
#include <optional>
#include <span>
#include <string>
#include <string_view>
#include <vector>

#include "page/html_writer.h"

namespace tavrel::page {

/// How a chart writes its values; page/number_text.h has the usual ones.
using NumberText = std::function<std::string(double value)>;

/// Values over days. The line has gaps where there is no data; a value between gaps is a dot.
struct LineChart {
  std::string name;                           // accessible
  std::vector<std::optional<double>> values;  // a day each
  /// Around the line, as from the lowest to the highest value of a day: of the same days, or empty.
  std::vector<std::optional<double>> lows = {};
  std::vector<std::optional<double>> highs = {};
  std::string first;  // labels of the first and the last day
  std::string last;
  NumberText text;
};
void writeLineChart(HtmlWriter& html, const LineChart& chart);

/// Columns over neighbouring intervals.
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

/// Labelled bars, one a row; also for histograms whose intervals are of different widths.
struct Bar {
  std::string label;
  double value = 0;  // negative ones have no bar
  std::string text;
};
void writeBars(HtmlWriter& html, std::string_view name, std::span<const Bar> bars);

/// Parts of a whole in one bar, with a legend.
struct Share {
  std::string label;
  double share = 0;  // of 1
  std::string text;  // behind the share in the legend; may be empty
};
void writeShares(HtmlWriter& html, std::string_view name, std::span<const Share> shares);

/// Estimates with their intervals over one common scale, a row each, with a line at `reference`.
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
  NumberText text;  // of the scale
};
void writeIntervals(HtmlWriter& html, const IntervalChart& chart);

}  // namespace tavrel::page
