#include <algorithm>
#include <cmath>

#include "base/format.h"
#include "page/charts.h"
#include "page/drawing.h"

namespace tavrel::page {
namespace {

using Values = std::vector<std::optional<double>>;

constexpr int kHeight = 100;  // of the drawing; one day is one unit wide

struct Range {
  double low = 0, high = 0;
  std::size_t known = 0;

  void take(const Values& values) {
    for (const auto& value : values) {
      if (!value || !std::isfinite(*value)) continue;
      low = known == 0 ? *value : std::min(low, *value);
      high = known == 0 ? *value : std::max(high, *value);
      ++known;
    }
  }
};

// The position from top to bottom.
int heightOf(double value, const Range& range) {
  if (range.low == range.high) return kHeight / 2;
  // Halving first keeps the difference of large values finite.
  const double share = (value / 2 - range.low / 2) / (range.high / 2 - range.low / 2);
  return static_cast<int>(std::lround((1 - share) * kHeight));
}

bool isKnown(const Values& values, std::size_t day) {
  return day < values.size() && values[day] && std::isfinite(*values[day]);
}

// Where the run of days with values that begins at `day` ends.
std::size_t endOfRun(const Values& values, std::size_t day) {
  while (isKnown(values, day))
    ++day;
  return day;
}

// The points of a run from the second one on, as relative steps.
void appendSteps(std::string& path, const Values& values, std::size_t begin, std::size_t end,
                 const Range& range) {
  int before = heightOf(*values[begin], range);
  for (std::size_t day = begin + 1; day < end; ++day) {
    const int height = heightOf(*values[day], range);
    appendFormat(path, "%s1 %d", day == begin + 1 ? "l" : " ", height - before);
    before = height;
  }
}

// Single days need a wider stroke: their lines have no length, and their areas no width.
struct Paths {
  std::string runs, singleDays;
};

Paths linePaths(const Values& values, const Range& range) {
  Paths paths;
  for (std::size_t day = 0; day < values.size(); ++day) {
    const std::size_t end = endOfRun(values, day);
    if (end == day) continue;
    const bool isSingle = end == day + 1;
    std::string& path = isSingle ? paths.singleDays : paths.runs;
    appendFormat(path, "M%zu %d%s", day, heightOf(*values[day], range), isSingle ? "h0" : "");
    appendSteps(path, values, day, end, range);
    day = end;
  }
  return paths;
}

// Areas that run along the lows and back along the highs.
Paths bandPaths(const LineChart& chart, const Range& range) {
  Paths paths;
  for (std::size_t day = 0; day < chart.lows.size(); ++day) {
    const std::size_t end = std::min(endOfRun(chart.lows, day), endOfRun(chart.highs, day));
    if (end <= day) continue;
    const bool isSingle = end == day + 1;
    std::string& path = isSingle ? paths.singleDays : paths.runs;
    appendFormat(path, "M%zu %d", day, heightOf(*chart.lows[day], range));
    appendSteps(path, chart.lows, day, end, range);
    int before = heightOf(*chart.highs[end - 1], range);
    appendFormat(path, "V%d", before);
    for (std::size_t back = end - 1; back-- > day;) {
      const int height = heightOf(*chart.highs[back], range);
      appendFormat(path, "%s-1 %d", back + 2 == end ? "l" : " ", height - before);
      before = height;
    }
    if (!isSingle) path += 'Z';
    day = end;
  }
  return paths;
}

void writePath(HtmlWriter& html, std::string_view style, const std::string& path) {
  if (!path.empty()) html.empty("path", {{"class", style}, {"d", path}});
}

std::string nameOf(const LineChart& chart, std::size_t known) {
  if (known == 0) return chart.name + ": no finite data";
  return format("%s: %s to %s, data for %zu of %zu days, lowest %s, highest %s, last %s",
                chart.name, chart.first, chart.last, known, chart.values.size(), chart.lowest,
                chart.highest, chart.latest);
}

}  // namespace

void writeLineChart(HtmlWriter& html, const LineChart& chart) {
  Range range;
  range.take(chart.values);
  const std::size_t known = range.known;
  range.take(chart.lows);
  range.take(chart.highs);
  const bool isFlat = chart.lowest == chart.highest;
  if (isFlat) range.high = range.low;
  const std::size_t width = std::max<std::size_t>(chart.values.size(), 2) - 1;
  html.begin("div", {{"class", "line"}});
  html.element("span", known == 0 ? "none" : chart.highest, {{"class", "top"}});
  if (!isFlat) html.element("span", chart.lowest, {{"class", "bottom"}});
  beginDrawing(html, nameOf(chart, known), width, kHeight);
  const Paths band = bandPaths(chart, range);
  writePath(html, "band", band.runs);
  writePath(html, "bar", band.singleDays);
  const Paths line = linePaths(chart.values, range);
  writePath(html, "", line.runs);
  writePath(html, "dot", line.singleDays);
  html.end();
  html.element("span", chart.first, {{"class", "first"}});
  html.element("span", chart.last, {{"class", "last"}});
  html.end();
}

}  // namespace tavrel::page
