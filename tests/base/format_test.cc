#include "base/format.h"

#include <cfloat>
#include <climits>
#include <cmath>
#include <cstdio>
#include <gtest/gtest.h>
#include <string>
#include <vector>

namespace tavrel {
namespace {

template <class... Arguments>
std::string printedByC(const std::string& format, Arguments... arguments) {
  int (*const print)(char*, std::size_t, const char*, ...) = std::snprintf;
  char text[20000];
  const int length = print(text, sizeof text, format.c_str(), arguments...);
  return {text, static_cast<std::size_t>(length)};
}

std::string printed(std::string_view format, const std::vector<FormatArgument>& arguments) {
  std::string out;
  const Status status = appendForeignFormat(out, format, arguments);
  return status ? out : "error: " + status.error().message;
}

// Compares with the C library for every combination of flags, with some widths and precisions.
template <class Argument>
void compare(const std::vector<std::string>& conversions, const std::vector<Argument>& values) {
  for (unsigned flags = 0; flags < 32; ++flags) {
    std::string start = "<%";
    for (unsigned i = 0; i < 5; ++i)
      if (flags >> i & 1U) start += "-+ #0"[i];
    for (const char* width : {"", "1", "6", "33"}) {
      for (const char* precision : {"", ".", ".1", ".3", ".17", ".40"}) {
        for (const std::string& conversion : conversions) {
          std::string format = start;
          format.append(width).append(precision).append(conversion).append(">");
          for (const Argument value : values)
            ASSERT_EQ(printed(format, {value}), printedByC(format, value)) << format;
        }
      }
    }
  }
}

TEST(Format, PrintsAsTheCLibraryDoes) {
  compare<int>({"d", "i", "o", "u", "x", "X", "hhd", "hhu", "hhx", "hd", "hu", "hX", "ho"},
               {0, 1, -1, 8, 127, 128, -129, 40000, 65536, INT_MAX, INT_MIN});
  compare<std::int64_t>({"lld", "lli", "jo", "jx", "llX", "qd"},
                        {0, 1, -1, 255, std::int64_t{1} << 32, INT64_MAX, INT64_MIN});
  // "l" means 64 bits everywhere.
  if constexpr (sizeof(long) == 8)
    compare<std::int64_t>({"ld", "lX"}, {0, 1, -1, 255, std::int64_t{1} << 32, INT64_MIN});
  compare<std::ptrdiff_t>({"zu", "td", "tx"}, {0, 1, -1, 255, PTRDIFF_MAX, PTRDIFF_MIN});
  compare<double>({"e", "E", "f", "F", "g", "G", "a", "A", "lf"},
                  {0.0, -0.0, 1.0, -1.5, 2.5, 0.1, 1.0 / 3, 99999.95, 999999.5, -1e-5, 1e15, 1e22,
                   DBL_MAX, DBL_MIN, 4.9e-324, HUGE_VAL, -HUGE_VAL, std::nan("")});
  compare<const char*>({"s"}, {"", "x", "longer than six"});
  compare<int>({"c"}, {'x', '%', 0xE4});
  int local = 0;
  compare<const void*>({"p"}, {nullptr, &local});
}

TEST(Format, TakesWidthAndPrecisionFromArguments) {
  for (const int w : {0, 3, 12, -12, 4096, -4096}) {
    for (const int p : {0, 2, 9, -1, INT_MIN}) {
      EXPECT_EQ(format("%0*.*d|%*.*f|%*.*s|", w, p, -42, w, p, 2.5, w, p, "abc"),
                printedByC("%0*.*d|%*.*f|%*.*s|", w, p, -42, w, p, 2.5, w, p, "abc"));
    }
  }
  EXPECT_EQ(format("%.4096f", DBL_MAX).size(), 309U + 1 + 4096);
  EXPECT_EQ(format("%*d", INT_MAX, 7), std::string(4095, ' ') + "7");
  EXPECT_EQ(format("%.*s", INT_MAX, std::string(5000, 'x')).size(), 5000U);
}

TEST(Format, PrintsWhatCDoesNotHave) {
  const plist::Value null;
  const char* const nullText = nullptr;
  const double negativeNan = std::copysign(NAN, -1.0);
  EXPECT_EQ(format("%{public}@|%{private, mask.hash}s|%{}d", plist::Value("a"), "b", 3), "a|b|3");
  EXPECT_EQ(format("%6@|%-6@|%2@|%.2@%.1@%.3@", plist::Value("abc"), plist::Value(12), "abc", "abc",
                   plist::Value(12), plist::Value(12)),
            "   abc|12    |abc|ab112");
  EXPECT_EQ(format("%@ %.2@ %8@ %.2s %-8s|", null, null, plist::Dictionary(), nullText, nullText),
            "(null) (null)   (null) (null) (null)  |");
  EXPECT_EQ(format("%f %+5.1F %05g", negativeNan, negativeNan, negativeNan), "nan  +NAN   nan");
  EXPECT_EQ(format("%s%c%s", std::string_view("a\0b", 3), '\0', std::string("c")),
            std::string("a\0b\0c", 5));
  EXPECT_EQ(format("%s %@ %@ %@", plist::String("s"), plist::Data(asBytes("\x01\xff")),
                   plist::Date::since1970(0), plist::Number(7)),
            "s <01ff> 1970-01-01 00:00:00 +0000 7");
  EXPECT_EQ(format("%u %d %x %hhu %.1f", std::uint8_t{255}, std::int8_t{-1}, std::int16_t{-1}, true,
                   0.25F),
            "255 -1 ffffffff 1 0.2");
}

TEST(Format, RefusesForeignTextsThatDoNotFitTheirArguments) {
  const std::string unknown = "its last character is no conversion";
  const std::string open = "the format ends within it";
  const std::string none = "no argument is left for it";
  const std::string number = "but its argument is a 32-bit integer";
  const std::string size = "its width or precision is ";
  const std::string tooWide = size + "more than 4096";
  const std::string integer = "it takes a 32-bit integer, ";
  const std::string longText(38, 'a');
  const std::tuple<std::string, std::vector<FormatArgument>, std::string, std::string> cases[] = {
      {"n=%n", {1}, R"("%n" at byte 2)", unknown},
      {"%d %", {1}, R"("%" at byte 3)", open},
      {"%-08.3l", {1}, R"("%-08.3l" at byte 0)", open},
      {"%1$d", {1}, R"("%1$" at byte 0)", unknown},
      {std::string("%\0d", 3), {1}, R"("%\u0000" at byte 0)", unknown},
      {"%4097d", {1}, R"("%4097" at byte 0)", tooWide},
      {"%.99999999999999999999d", {1}, R"("%.9999" at byte 0)", tooWide},
      {"%*d", {INT_MIN, 1}, R"("%*d" at byte 0)", size + "2147483648, more than 4096"},
      {"%.*s", {4097, "x"}, R"("%.*s" at byte 0)", size + "4097, more than 4096"},
      {"%*d",
       {std::int64_t{1}, 1},
       R"("%*d" at byte 0)",
       integer + "but its argument is a 64-bit integer"},
      {"%u %s", {1, 2}, R"("%s" at byte 3)", "it takes a text, " + number},
      {"%f", {1}, R"("%f" at byte 0)", "it takes a double, " + number},
      {"%ls", {"x"}, R"("%ls" at byte 0)", "'s' takes no length"},
      {"%*d", {1}, R"("%*d" at byte 0)", none},
      {"%{" + longText + longText + "}s", {}, "\"%{" + longText + "\" at byte 0", none}};
  for (const auto& [text, arguments, place, reason] : cases) {
    std::string out = "before ";
    const Status status = appendForeignFormat(out, text, arguments);
    EXPECT_EQ(out, "before ") << text;
    ASSERT_FALSE(status) << text;
    EXPECT_EQ(status.error().message, place + " of the format: " + reason);
  }
  EXPECT_EQ(printed("%u%%", {1, 2, 3}), "error: the format uses 1 of its 3 arguments");
}

// The check that prevents a wrong literal from compiling.
constexpr FormatFault faultWith(std::string_view text, std::initializer_list<ArgumentType> types) {
  return checkFormat(text, {types.begin(), types.size()});
}
static_assert(faultWith("%d %5.*s%%", {ArgumentType::Int, ArgumentType::Int, ArgumentType::Text}) ==
              FormatFault::None);
static_assert(faultWith("%d", {ArgumentType::Long}) == FormatFault::WrongArgument);
static_assert(faultWith("%%", {ArgumentType::Int}) == FormatFault::UnusedArgument);

}  // namespace
}  // namespace tavrel
