// The exact output of the page's writers.
#include <gtest/gtest.h>
#include <limits>

#include "page/charts.h"
#include "page/document.h"
#include "page/number_text.h"
#include "page/table.h"

namespace tavrel::page {
namespace {

constexpr double kNan = std::numeric_limits<double>::quiet_NaN();

// The values of an attribute, one per line.
std::string attributes(const HtmlWriter& html, const std::string& name) {
  std::string found;
  const std::string begin = " " + name + "=\"";
  const std::string text(html.written());
  for (std::size_t at = text.find(begin); at != std::string::npos; at = text.find(begin, at)) {
    at += begin.size();
    found += text.substr(at, text.find('"', at) - at) + "\n";
  }
  return found;
}

TEST(HtmlWriterTest, KeepsTextsText) {
  HtmlWriter html;
  html.begin("p", {{"title", "\"><script>'&"}, {"class", ""}});
  html.text("<b>&amp;\n\t\x01\x7f\xff\u0085\uFFFE\u061C\u202E\u05D0");
  html.name("a.b..<c");
  html.empty("br");
  html.end();
  EXPECT_EQ(html.written(),
            "<p "
            "title=\"&quot;&gt;&lt;script&gt;'&amp;\">&lt;b&gt;&amp;amp;"
            "\n\t␁␡\uFFFD\uFFFD\uFFFD\uFFFD\uFFFD\u05D0"
            "<bdi>a.<wbr>b.<wbr>.<wbr>&lt;c</bdi><br/></p>");
}

TEST(DocumentTest, ListsItsSections) {
  Document document("A <page>");
  document.section("One & two").text("x");
  document.section("Three");
  const std::string text = document.text();
  for (const char* part :
       {"content=\"default-src 'none'; style-src 'unsafe-inline'\">",
        "<title>A &lt;page&gt;</title>", "<h1><bdi>A &lt;page&gt;</bdi></h1>",
        "<li><a href=\"#s1\">One &amp; two</a></li><li><a href=\"#s2\">Three</a></li>",
        "<section aria-labelledby=\"s1\"><h2 id=\"s1\">One &amp; two</h2>x</section>"})
    EXPECT_NE(text.find(part), std::string::npos) << part;
}

TEST(TableTest, MarksNamesAndNumbers) {
  HtmlWriter html;
  Table table(html, "T", {{"Key", Table::Align::Name}, {"n", Table::Align::Number}, {"Unit"}});
  for (const char* key : {"a", "b"}) {
    table.row();
    table.cell(key);
    table.cell("1");
    table.cell("");
  }
  table.end();
  const std::string row =
      "<td class=\"number\" data-title=\"n\">1</td><td data-title=\"Unit\"></td>";
  EXPECT_EQ(html.written(),
            "<table aria-label=\"T\"><thead><tr><th scope=\"col\">Key</th><th scope=\"col\" "
            "class=\"number\">n</th><th scope=\"col\">Unit</th></tr></thead><tbody><tr><th "
            "scope=\"row\">a</th>" +
                row + "</tr><tr><th scope=\"row\">b</th>" + row + "</tr></tbody></table>");
}

TEST(NumberTest, IsShortAndHasItsUnit) {
  const std::pair<double, const char*> kNumbers[] = {{0, "0"},
                                                     {-0.0, "−0"},
                                                     {9999, "9999"},
                                                     {12345, "12\u202F345"},
                                                     {-1234567, "−1\u202F234\u202F567"},
                                                     {1.23456, "1.235"},
                                                     {99999.5, "100\u202F000"},
                                                     {0.000123456, "0.0001235"},
                                                     {1e300, "1e+300"},
                                                     {kNan, "nan"}};
  for (const auto& [value, text] : kNumbers)
    EXPECT_EQ(shortNumber(value), text);
  EXPECT_EQ(exactNumber(-12345.678901), "−12\u202F345.678901");
  EXPECT_EQ(shortNumber(std::numeric_limits<std::int64_t>::min()),
            "−9\u202F223\u202F372\u202F036\u202F854\u202F775\u202F808");
  const std::tuple<double, const char*, const char*> kFigures[] = {
      {5, "count", "5"},
      {12.5, "percent", "12.5\u00A0%"},
      {2048, "MiB", "2.0 GiB"},
      {1, "bytes", "1 byte"},
      {12.5, "milliseconds", "12.5 ms"},
      {119, "seconds", "119 s"},
      {7199, "seconds", "120 min"},
      {7200, "seconds", "2 h"},
      {36, "hours", "36 h"},
      {60, "hours", "2.5 days"},
      {41250, "thousandths of a degree Celsius", "41.3 °C"},
      {3, "pages", "3 pages"}};
  for (const auto& [value, unit, text] : kFigures)
    EXPECT_EQ(figureText(value, unit), text);
  std::string units;
  for (const char* unit :
       {"KiB", "nanoseconds", "microseconds", "minutes", "degrees Celsius", "millivolts",
        "microvolts", "milliamperes", "microamperes", "microwatts", "microjoules"})
    units += figureText(1500.0, unit) + "; ";
  EXPECT_EQ(
      units,
      "1.5 MiB; 1.5 µs; 1.5 ms; 25 h; 1500 °C; 1.5 V; 1.5 mV; 1.5 A; 1.5 mA; 1.5 mW; 1.5 mJ; ");
  constexpr std::int64_t kPages = (std::int64_t{1} << 53) + 1;
  EXPECT_EQ(figureText(kPages, "pages"), "9\u202F007\u202F199\u202F254\u202F740\u202F993 pages");
  EXPECT_EQ(figureText(std::int64_t{2048}, "MiB"), "2.0 GiB");
  EXPECT_EQ(exactFigure(204900.5, "MiB"), "204\u202F900.5 MiB");
}

TEST(LineChartTest, HasGapsDotsAndABand) {
  LineChart chart{"K", {0, 10, {}, 5, kNan, 10, 7.5, 5}, {}, {}, "first", "last", "0", "10", "x"};
  HtmlWriter line;
  writeLineChart(line, chart);
  EXPECT_EQ(attributes(line, "d"), "M0 100l1 -100M5 0l1 25 1 25\nM3 50h0\n");
  EXPECT_EQ(attributes(line, "viewBox"), "0 0 7 100\n");
  EXPECT_EQ(attributes(line, "aria-label"),
            "K: first to last, data for 6 of 8 days, lowest 0, highest 10, last x\n");
  chart.values = {5, 5, {}, 5};
  chart.lows = {0, 2.5, {}, 0};
  chart.highs = {10, 7.5, {}, 10};
  HtmlWriter band;
  writeLineChart(band, chart);
  EXPECT_EQ(attributes(band, "d"), "M0 100l1 -25V25l-1 -25Z\nM3 100V0\nM0 50l1 0\nM3 50h0\n");
  EXPECT_EQ(attributes(band, "class"), "line\ntop\nbottom\nband\nbar\ndot\nfirst\nlast\n");
  // Different values with the same label.
  chart.lowest = "10";
  HtmlWriter flat;
  writeLineChart(flat, chart);
  EXPECT_EQ(attributes(flat, "d"), "M0 50l1 0V50l-1 0Z\nM3 50V50\nM0 50l1 0\nM3 50h0\n");
  chart = {"K", {{}, {}}, {}, {}, "a", "b", "", "", ""};
  HtmlWriter nothing;
  writeLineChart(nothing, chart);
  EXPECT_EQ(attributes(nothing, "aria-label") + attributes(nothing, "d"), "K: no finite data\n");
  chart = {"K", {-1.7e308, 1.7e308, 0}, {}, {}, "a", "b", "-", "+", "0"};
  HtmlWriter wide;
  writeLineChart(wide, chart);
  EXPECT_EQ(attributes(wide, "d"), "M0 100l1 -100 1 50\n");
}

TEST(BarChartsTest, ShowWhatIsNotNothing) {
  HtmlWriter histogram;
  writeHistogram(histogram, {"H", {{"(0, 1]", 1}, {"(1, 2]", 0}, {"(2, 3]", 1e6}}, "0", "3"});
  writeHistogram(histogram, {"I", {{"(0, 1]", 1}}, "0", "1"});
  EXPECT_EQ(attributes(histogram, "x") + attributes(histogram, "height"),
            "0\n40\n0\n4\n1000\n1000\n");
  EXPECT_EQ(attributes(histogram, "aria-label"),
            "H: 1\u202F000\u202F001 values, most in (2, 3]: 1\u202F000\u202F000\n"
            "I: 1 value, most in (0, 1]: 1\n");
  HtmlWriter bars;
  const Bar kBars[] = {{"a.b", 0.5, "5"}, {"b", -1, "-1"}, {"c", kNan, "?"}, {"d", 0.25, ""}};
  writeBars(bars, "B", kBars);
  EXPECT_EQ(attributes(bars, "width"), "1000\n0\n0\n500\n");
  EXPECT_EQ(attributes(bars, "aria-label"), "B\na.b: 5\nb: -1\nc: ?\nd: \n");
  EXPECT_EQ(
      bars.written().find("<ul class=\"bars\" aria-label=\"B\"><li><span><bdi>a.<wbr>b</bdi>"), 0U);
  HtmlWriter shares;
  std::vector<Share> parts = {
      {"on", 0.25, "1 s"}, {"no", kNan, ""}, {"off", 0.75, ""}, {"x", 9, ""}};
  writeShares(shares, "S", parts);
  EXPECT_EQ(attributes(shares, "x") + attributes(shares, "width"), "0\n250\n250\n750\n");
  EXPECT_EQ(attributes(shares, "style"),
            "opacity:1.00\nopacity:0.75\nopacity:0.50\nopacity:0.25\n");
  EXPECT_NE(shares.written().find("<bdi>on</bdi></span><b>25.0 %</b><small>1 s</small></li><li>"),
            std::string_view::npos);
  parts = std::vector<Share>(10, {"t", 1e-9, ""});
  HtmlWriter tiny;
  writeShares(tiny, "T", parts);
  EXPECT_EQ(
      attributes(tiny, "aria-label"),
      "T: t 0.0 %, t 0.0 %, t 0.0 %, t 0.0 %, t 0.0 %, t 0.0 %, t 0.0 %, t 0.0 % and 2 more\n");
  EXPECT_EQ(attributes(tiny, "width"), "");
}

TEST(IntervalChartTest, HasOneScale) {
  HtmlWriter html;
  writeIntervals(
      html,
      {"I",
       {{"a", -5, 0, 5, "0", false}, {"b", 5, 10, 15, "10", true}, {"c", kNan, 0, 0, "?", false}},
       0,
       [](double value) { return shortNumber(value); }});
  EXPECT_EQ(attributes(html, "d"),
            "M250 0V20\nM0 10H500\nM250 10h0\nM250 0V20\nM500 10H1000\nM750 10h0\nM250 0V20\n");
  EXPECT_EQ(attributes(html, "style"), "left:25.0%\n");
  EXPECT_NE(html.written().find("<li class=\"notable\"><span><bdi>b"), std::string_view::npos);
}

}  // namespace
}  // namespace tavrel::page
