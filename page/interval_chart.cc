#include <algorithm>
#include <cmath>

#include "base/format.h"
#include "page/charts.h"
#include "page/drawing.h"

namespace tavrel::page {
namespace {

constexpr int kLength = 1000;
constexpr int kHeight = 20;

bool isDrawn(const IntervalChart::Row& row) {
  return std::isfinite(row.lower) && std::isfinite(row.estimate) && std::isfinite(row.upper);
}

struct Scale {
  double low, high;

  int at(double value) const {
    if (!(low < high)) return kLength / 2;
    const double share = (value / 2 - low / 2) / (high / 2 - low / 2);
    return static_cast<int>(std::lround(std::clamp(share, 0.0, 1.0) * kLength));
  }
};

void writeRow(HtmlWriter& html, const IntervalChart& chart, const IntervalChart::Row& row,
              const Scale& scale) {
  constexpr int kMiddle = kHeight / 2;
  html.begin("li", {{"class", row.isNotable ? "notable" : ""}});
  html.begin("span");
  html.name(row.label);
  html.end();
  beginDrawing(html, format("%s: %s", row.label, row.text), kLength, kHeight);
  html.empty("path", {{"class", "reference"},
                      {"d", format("M%d 0V%d", scale.at(chart.reference), kHeight)}});
  if (isDrawn(row)) {
    html.empty("path",
               {{"d", format("M%d %dH%d", scale.at(row.lower), kMiddle, scale.at(row.upper))}});
    html.empty("path",
               {{"class", "dot"}, {"d", format("M%d %dh0", scale.at(row.estimate), kMiddle)}});
  }
  html.end();
  html.element("span", row.text, {{"class", "number"}});
  html.end();
}

}  // namespace

void writeIntervals(HtmlWriter& html, const IntervalChart& chart) {
  Scale scale{chart.reference, chart.reference};
  for (const IntervalChart::Row& row : chart.rows) {
    if (!isDrawn(row)) continue;
    scale.low = std::min({scale.low, row.lower, row.estimate});
    scale.high = std::max({scale.high, row.upper, row.estimate});
  }
  html.begin("div", {{"class", "intervals"}});
  html.begin("ul", {{"aria-label", chart.name}});
  for (const IntervalChart::Row& row : chart.rows)
    writeRow(html, chart, row, scale);
  html.end();
  html.begin("div", {{"class", "scale"}});
  html.begin("p");
  html.element("span", chart.text(scale.low));
  // Near an end, its label would collide with that of the end.
  const double reference = static_cast<double>(scale.at(chart.reference)) / kLength;
  if (reference > 0.2 && reference < 0.8) {
    html.element("span", chart.text(chart.reference),
                 {{"class", "at"}, {"style", format("left:%.1f%%", 100 * reference)}});
  }
  html.element("span", chart.text(scale.high));
  html.end();
  html.end();
  html.end();
}

}  // namespace tavrel::page
