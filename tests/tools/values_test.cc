// The small parts of the tool: values as JSON, days, tables.
#include <cmath>
#include <limits>

#include "device.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"
#include "tools/console/value_text.h"

namespace tavrel {
namespace {

TEST(JsonValue, EveryValueReadsBackEqual) {
  const plist::Value everything = plist::Dictionary{
      {"least", std::numeric_limits<std::int64_t>::min()},
      {"most", std::numeric_limits<std::uint64_t>::max()},
      {"beyond doubles", std::int64_t{9007199254740993}},
      {"real", 2.0},
      {"tenth", 0.1},
      {"negative zero", -0.0},
      {"inf", -HUGE_VAL},
      {"nan", std::nan("")},
      {"yes", true},
      {"text", "tab\t quote\" ü"},
      {"bytes", plist::Data(asBytes("\x01\xff\x02\x03"))},
      {"date", plist::Date::since1970(1794851738.25)},
      {"array", plist::Array{1, plist::Array::create(), plist::Dictionary::create()}},
      {"$data", "no bytes"},
      {"$$", 1}};
  const std::string text = jsonOf(everything).dump();
  EXPECT_NE(text.find(R"("$$data":"no bytes","array":[1,[],{}],"beyond doubles":9007199254740993)"),
            std::string::npos)
      << text;
  EXPECT_NE(text.find(R"("bytes":{"$data":"Af8CAw=="},"date":{"$date":"2026-11-16T17:55:38.25Z"})"),
            std::string::npos)
      << text;
  const auto back = parseJsonValue(text);
  ASSERT_TRUE(back) << back.error().message;
  EXPECT_EQ(*back, everything);
  EXPECT_TRUE(std::signbit(back->dictionary().number("negative zero")->real()));
  EXPECT_TRUE(back->dictionary().number("real")->isFloating());
}

TEST(JsonValue, RefusesWhatAPropertyListCannotHold) {
  const std::pair<std::string, std::string> kCases[] = {
      {R"({"a": {"b": null}})", "JSON/a/b: a property list cannot contain null"},
      {"18446744073709551616", "JSON: the integer 18446744073709551616 does not fit 64 bits"},
      {R"({"$data": "?"})", "JSON/$data: \"$data\" is not base64"},
      {R"({"$real": "1"})", "JSON/$real: \"$real\" is not one of \"nan\", \"inf\", \"-inf\""},
      {R"({"$date": "today"})",
       "JSON/$date: not a date: today: give YYYY-MM-DDTHH:MM:SSZ or YYYY-MM-DD"},
      {R"({"$data": "", "x": 1})",
       "JSON/x: \"$data\" must be the only member of its object, and a string"},
      {R"({"$data": "AA==", "$$data": "QUJD"})",
       "JSON/$$data: \"$data\" must be the only member of its object, and a string"},
      {std::string(1000, '1'),
       "JSON at column 1000: number overflow parsing '" + std::string(254, '1') + "..."},
      {"[1,\n 1e999]", "JSON at line 2, column 6: number overflow parsing '1e999'"},
      {R"([1, {"a": [2, {"$data": "?"}]}])", "JSON/1/a/1/$data: \"$data\" is not base64"},
      {std::string(128, '[') + "{}", "JSON: nested too deeply"},
      {R"({"$x": 1})", "JSON/$x: \"$x\" is not a known form: write a key that begins with $ as $$"},
      {std::string(200, '['), "JSON: nested too deeply"}};
  for (const auto& [text, message] : kCases) {
    const auto value = parseJsonValue(text);
    ASSERT_FALSE(value) << text;
    EXPECT_EQ(value.error().message, message);
  }
  const auto cut = parseJsonValue("{\"a\":\n [1,");
  ASSERT_FALSE(cut);
  EXPECT_NE(cut.error().message.find("line 2, column 5"), std::string::npos) << cut.error().message;
}

TEST(Days, AreNumbersOrDates) {
  const std::tuple<std::string_view, std::int32_t, std::string_view> kCases[] = {
      {"0", 0, "0 (1970-01-01)"},
      {"2026-11-16", 20773, "20773 (2026-11-16)"},
      {"-1", -1, "-1 (1969-12-31)"},
      {"2147483647", 2147483647, "2147483647 (5881580-07-11)"},
      {"-2147483648", std::numeric_limits<std::int32_t>::min(), "-2147483648 (-5877641-06-23)"}};
  for (const auto& [text, day, shown] : kCases) {
    const auto parsed = parseDay(text);
    ASSERT_TRUE(parsed) << text;
    EXPECT_EQ(*parsed, day);
    EXPECT_EQ(dayText(day), shown);
  }
  for (const std::string_view text : {"", "1x", "2147483648", "2026-02-30", "5881580-07-12"})
    ASSERT_FALSE(parseDay(text)) << text;
  EXPECT_EQ(parseDay("today").error().message,
            "not a day: today: give a 32-bit day number or YYYY-MM-DD");
  EXPECT_EQ(*parseDay("today", 20773), 20773);
  EXPECT_EQ(*parseDay("yesterday", 20773), 20772);
}

std::string printed(Table table, std::optional<std::size_t> columns = std::nullopt,
                    bool isColoured = false) {
  std::ostringstream out;
  table.print({out, columns, isColoured});
  return out.str();
}

TEST(Table, AlignsAndCutsTheWidestColumn) {
  Table table({{"KEY"}, {"N", Table::Align::Right}}, 2);
  table.add({"ü", "1"});
  table.add({"a\x1b[31m\n\xff\xe2\x80\xae", "10"});
  table.add({"a long key indeed", "100"});
  EXPECT_EQ(printed(table),
            "  KEY                            N\n"
            "  ü                              1\n"
            "  a\\x1b[31m\\n\\xff\\xe2\\x80\\xae   10\n"
            "  a long key indeed            100\n");
  EXPECT_EQ(printed(table, 20),
            "  KEY              N\n"
            "  ü                1\n"
            "  a\\x1b[31m\\n\\…   10\n"
            "  a long key i…  100\n");
  EXPECT_EQ(printed(table, 14), printed(table)) << "cutting would not make it fit";
  // In a pipe, nothing is cut, and a long cell pushes only its own row to the right.
  const std::string longKey(100, 'k');
  table.add({longKey, "1"});
  EXPECT_EQ(printed(table).substr(0, 55), "  KEY" + std::string(49, ' ') + "N");
  EXPECT_TRUE(printed(table).ends_with("\n  " + longKey + "    1\n"));
}

TEST(Table, BarsTakeTheColumnsThatAreLeft) {
  Table table({{"", Table::Align::Whole}, {"", Table::Align::Bar}, {""}});
  table.add({"a", Table::Cell::bar(10, 10), "x"});
  table.add({"b", Table::Cell::bar(5, 10), "y"});
  table.add({"c", Table::Cell::bar(1, 1000), "z"});
  table.add({"d", Table::Cell::bar(0, 10), ""});
  EXPECT_EQ(printed(table, 26),
            "a  ####################  x\n"
            "b  ##########            y\n"
            "c  #                     z\n"
            "d\n");
  EXPECT_EQ(printed(table).find('\n'), 80U);
  EXPECT_EQ(printed(table, 9).find('\n'), 14U);  // at least eight
}

TEST(Table, MarksWhatStandsOutOnATerminalWithColours) {
  Table table({{"KEY"}, {"N", Table::Align::Right}});
  table.add({{"errors", Emphasis::Alarm}, {"7", Emphasis::Alarm}});
  table.add({"fine", "10"});
  EXPECT_EQ(printed(table, 80), "KEY      N\nerrors   7\nfine    10\n");
  EXPECT_EQ(printed(table, 80, true),
            "\x1b[1mKEY\x1b[0m      \x1b[1mN\x1b[0m\n"
            "\x1b[1;31merrors\x1b[0m   \x1b[1;31m7\x1b[0m\n"
            "fine    10\n");
}

TEST(ValueText, ShowsTheKindOfAValue) {
  const plist::Dictionary value{
      {"b", plist::Array{true, 2.0, 2, -0.0, std::nan(""), plist::Data(asBytes("\xff"))}},
      {"a\n", plist::Array::create()},
      {"c", plist::Dictionary{{"d", "e\x1b"}, {"e", plist::Date::ofDay(0)}}}};
  std::ostringstream out;
  printOutline(out, value);
  EXPECT_EQ(out.str(),
            "a\\n = []\nb:\n  [0] = true\n  [1] = 2.0\n  [2] = 2\n  [3] = -0.0\n  [4] = nan\n"
            "  [5] = <ff>\nc:\n  d = \"e\\u001b\"\n  e = 1970-01-01 00:00:00 +0000\n");
  EXPECT_EQ(inlineText(value), R"({"a\n": [], "b": [true, 2.0, 2, -0.0, nan, <ff>], )"
                               R"("c": {"d": "e\u001b", "e": 1970-01-01 00:00:00 +0000}})");
}

}  // namespace
}  // namespace tavrel
