// Charts of bars: histograms, labelled bars, shares of a whole.
#include <algorithm>
#include <cmath>

#include "base/format.h"
#include "base/quantity_text.h"
#include "page/charts.h"
#include "page/drawing.h"
#include "page/number_text.h"

namespace tavrel::page {
namespace {

// For drawings, which are stretched to fill their place.
constexpr int kLength = 1000;
// Keeps values other than 0 visible.
constexpr int kLeastLength = 4;

int barLength(double value, double largest) {
  if (!std::isfinite(value) || value <= 0) return 0;
  const double share = std::min(value / largest, 1.0);
  return std::max(kLeastLength, static_cast<int>(std::lround(share * kLength)));
}

struct Rectangle {
  int x = 0, y = 0, width = 0, height = 0;
};

void writeRectangle(HtmlWriter& html, const Rectangle& rectangle, double opacity = 1) {
  const std::string x = std::to_string(rectangle.x), y = std::to_string(rectangle.y);
  const std::string width = std::to_string(rectangle.width);
  const std::string height = std::to_string(rectangle.height);
  if (opacity == 1) {
    html.empty("rect", {{"x", x}, {"y", y}, {"width", width}, {"height", height}});
  } else {
    html.empty("rect", {{"x", x},
                        {"y", y},
                        {"width", width},
                        {"height", height},
                        {"opacity", format("%.2f", opacity)}});
  }
}

// The opacity of a part: neighbours differ, for any number and in both colour schemes.
double opacityOf(std::size_t index, std::size_t count) {
  constexpr double kFaintest = 0.25;
  if (count < 2) return 1;
  return 1 - (1 - kFaintest) * static_cast<double>(index) / static_cast<double>(count - 1);
}

}  // namespace

void writeHistogram(HtmlWriter& html, const Histogram& histogram) {
  constexpr int kCell = 20, kColumn = 19;
  Histogram::Cell most;
  double total = 0;
  for (const Histogram::Cell& cell : histogram.cells) {
    if (cell.count > most.count) most = cell;
    total += cell.count;
  }
  std::string name = histogram.name + ": ";
  name += total > 0 ? format("%s %s, most in %s: %s", shortNumber(total),
                             total == 1 ? "value" : "values", most.label, shortNumber(most.count))
                    : "no values";
  html.begin("div", {{"class", "histogram"}});
  html.element("span", shortNumber(most.count), {{"class", "top"}});
  beginDrawing(html, name, histogram.cells.size() * kCell, kLength);
  int left = 0;
  for (const Histogram::Cell& cell : histogram.cells) {
    const int height = barLength(cell.count, most.count);
    if (height > 0) writeRectangle(html, {left, kLength - height, kColumn, height});
    left += kCell;
  }
  html.end();
  html.element("span", histogram.lowest, {{"class", "first"}});
  html.element("span", histogram.highest, {{"class", "last"}});
  html.end();
}

void writeBars(HtmlWriter& html, std::string_view name, std::span<const Bar> bars) {
  constexpr int kHeight = 10;
  double largest = 0;
  for (const Bar& bar : bars)
    if (std::isfinite(bar.value)) largest = std::max(largest, bar.value);
  html.begin("ul", {{"class", "bars"}, {"aria-label", name}});
  for (const Bar& bar : bars) {
    html.begin("li");
    html.begin("span");
    html.name(bar.label);
    html.end();
    beginDrawing(html, format("%s: %s", bar.label, bar.text), kLength, kHeight);
    writeRectangle(html, {0, 0, barLength(bar.value, largest), kHeight});
    html.end();
    html.element("span", bar.text, {{"class", "number"}});
    html.end();
  }
  html.end();
}

void writeShares(HtmlWriter& html, std::string_view name, std::span<const Share> shares) {
  constexpr int kHeight = 10;
  constexpr std::size_t kNamed = 8;
  std::string spoken(name);
  for (std::size_t i = 0; i < std::min(kNamed, shares.size()); ++i) {
    appendFormat(spoken, "%s %s %s", i == 0 ? ":" : ",", shares[i].label,
                 percentText(shares[i].share));
  }
  if (shares.size() > kNamed) appendFormat(spoken, " and %zu more", shares.size() - kNamed);
  html.begin("div", {{"class", "shares"}});
  beginDrawing(html, spoken, kLength, kHeight);
  double left = 0;
  for (std::size_t i = 0; i < shares.size(); ++i) {
    if (!std::isfinite(shares[i].share) || shares[i].share <= 0) continue;
    const double right = std::min(left + shares[i].share, 1.0);
    const int from = static_cast<int>(std::lround(left * kLength));
    const int to = static_cast<int>(std::lround(right * kLength));
    if (to > from) writeRectangle(html, {from, 0, to - from, kHeight}, opacityOf(i, shares.size()));
    left = right;
  }
  html.end();
  html.begin("ul");
  for (std::size_t i = 0; i < shares.size(); ++i) {
    html.begin("li");
    const std::string opacity = format("opacity:%.2f", opacityOf(i, shares.size()));
    html.element("i", "", {{"style", opacity}});
    html.begin("span");
    html.name(shares[i].label);
    html.end();
    html.element("b", percentText(shares[i].share));
    if (!shares[i].text.empty()) html.element("small", shares[i].text);
    html.end();
  }
  html.end();
  html.end();
}

}  // namespace tavrel::page
