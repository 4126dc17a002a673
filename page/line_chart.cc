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

std::string linePath(const Values& values, const Range& range) {
  std::string path;
  for (std::size_t day = 0; day < values.size(); ++day) {
    const std::size_t end = endOfRun(values, day);
    if (end == day) continue;
    appendFormat(path, "M%zu %d", day, heightOf(*values[day], range));
    // A line of length 0 shows as a dot.
    if (end == day + 1) path += "h0";
    appendSteps(path, values, day, end, range);
    day = end;
  }
  return path;
}

// Areas that run along the lows and back along the highs.
std::string bandPath(const LineChart& chart, const Range& range) {
  std::string path;
  for (std::size_t day = 0; day < chart.lows.size(); ++day) {
    const std::size_t end = std::min(endOfRun(chart.lows, day), endOfRun(chart.highs, day));
    if (end <= day + 1) continue;
    appendFormat(path, "M%zu %d", day, heightOf(*chart.lows[day], range));
    appendSteps(path, chart.lows, day, end, range);
    int before = heightOf(*chart.highs[end - 1], range);
    appendFormat(path, "V%d", before);
    for (std::size_t back = end - 1; back-- > day;) {
      const int height = heightOf(*chart.highs[back], range);
      appendFormat(path, "%s-1 %d", back + 2 == end ? "l" : " ", height - before);
      before = height;
    }
    path += 'Z';
    day = end;
  }
  return path;
}

std::string nameOf(const LineChart& chart, const Range& line) {
  if (line.known == 0) return chart.name + ": no data";
  std::string name = format("%s: %s to %s, data for %zu of %zu days, lowest %s, highest %s",
                            chart.name, chart.first, chart.last, line.known, chart.values.size(),
                            chart.text(line.low), chart.text(line.high));
  for (auto value = chart.values.rbegin(); value != chart.values.rend(); ++value) {
    if (!*value || !std::isfinite(**value)) continue;
    return name + ", last " + chart.text(**value);
  }
  return name;
}

}  // namespace

void writeLineChart(HtmlWriter& html, const LineChart& chart) {
  Range line;
  line.take(chart.values);
  Range range = line;
  range.take(chart.lows);
  range.take(chart.highs);
  const std::size_t width = std::max<std::size_t>(chart.values.size(), 2) - 1;
  html.begin("div", {{"class", "line"}});
  html.element("span", range.known == 0 ? "none" : chart.text(range.high), {{"class", "top"}});
  if (range.low != range.high) html.element("span", chart.text(range.low), {{"class", "bottom"}});
  beginDrawing(html, nameOf(chart, line), width, kHeight);
  if (const std::string band = bandPath(chart, range); !band.empty())
    html.empty("path", {{"class", "band"}, {"d", band}});
  html.empty("path", {{"d", linePath(chart.values, range)}});
  html.end();
  html.element("span", chart.first, {{"class", "first"}});
  html.element("span", chart.last, {{"class", "last"}});
  html.end();
}

}  // namespace tavrel::page
