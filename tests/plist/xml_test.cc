#include "platform/plist/xml.h"

#include <cmath>
#include <gtest/gtest.h>
#include <limits>
#include <string>
#include <vector>

#include "base/limits.h"
#include "platform/plist/binary.h"

namespace tavrel::plist {
namespace {

using namespace std::string_literals;

std::string wrapped(const std::string& body) {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n" + body +
         "</plist>\n";
}

std::string errorOf(const std::string& document) {
  const auto value = readXml(asBytes(document));
  return value ? "no error" : value.error().message;
}

TEST(Xml, WritesSortedIndentedDocument) {
  const std::vector<std::byte> bytes(58, std::byte{0xFF});
  const Dictionary document{
      {"b", Array{1, -2, true, false, Array::create(), Dictionary::create()}},
      {"a<&>", "x<y>&\r\n\"'"},
      {"c", Dictionary{{"when", Date::sinceEpoch(-0.25)}, {"bytes", Data(bytes)}}},
      {"\xC3\xA9", ""}};
  EXPECT_EQ(*writeXml(document),
            wrapped("<dict>\n"
                    "\t<key>a&lt;&amp;&gt;</key>\n"
                    "\t<string>x&lt;y&gt;&amp;&#13;\n\"'</string>\n"
                    "\t<key>b</key>\n"
                    "\t<array>\n"
                    "\t\t<integer>1</integer>\n\t\t<integer>-2</integer>\n"
                    "\t\t<true/>\n\t\t<false/>\n\t\t<array/>\n\t\t<dict/>\n"
                    "\t</array>\n"
                    "\t<key>c</key>\n"
                    "\t<dict>\n"
                    "\t\t<key>bytes</key>\n\t\t<data>\n\t\t" +
                    std::string(76, '/') +
                    "\n\t\t/w==\n\t\t</data>\n"
                    "\t\t<key>when</key>\n\t\t<date>2000-12-31T23:59:59Z</date>\n"
                    "\t</dict>\n"
                    "\t<key>\xC3\xA9</key>\n\t<string></string>\n"
                    "</dict>\n"));
}

TEST(Xml, ScalarsAreWrittenAndReadBack) {
  using Case = std::pair<Value, std::string>;
  for (const auto& [value, text] :
       {Case(INT64_MIN, "<integer>-9223372036854775808</integer>"),
        Case(UINT64_MAX, "<integer>18446744073709551615</integer>"), Case(true, "<true/>"),
        Case(false, "<false/>"), Case(0.1F, "<real>0.10000000149011612</real>"),
        Case(-0.0, "<real>-0</real>"), Case(5e-324, "<real>5e-324</real>"),
        Case(-std::numeric_limits<double>::quiet_NaN(), "<real>nan</real>"),
        Case(Date::ofDay(INT32_MIN), "<date>-5877641-06-23T00:00:00Z</date>"),
        Case(Data(asBytes("ab")), "<data>\nYWI=\n</data>"),
        Case(Data(asBytes("a")), "<data>\nYQ==\n</data>"),
        Case(Data(ByteSpan()), "<data>\n</data>"), Case(" \t\n\r ", "<string> \t\n&#13; </string>"),
        Case("\xF0\x9F\x98\x80\x7F\xC2\x85", "<string>\xF0\x9F\x98\x80\x7F\xC2\x85</string>")}) {
    EXPECT_EQ(*writeXml(value), wrapped(text + "\n"));
    EXPECT_EQ(*readXml(asBytes(wrapped(text + "\n"))), value) << text;
  }
  EXPECT_TRUE(std::signbit(readXml(asBytes(wrapped("<real>-0</real>")))->number()->real()));
}

TEST(Xml, WhatXmlCannotHoldIsReplaced) {
  const auto text = writeXml("a\0b\x1B\xEF\xBF\xBE\xED\xA0\x80z"s);
  EXPECT_EQ(*text, wrapped("<string>a\uFFFDb\uFFFD\uFFFD\uFFFD\uFFFD\uFFFDz</string>\n"));

  // Keys that become equal stay distinct, also from a key that already had that text.
  const Dictionary clash{{"k\x02", 2}, {"k\x01", 1}, {"k\uFFFD2", 3}, {"k", 0}};
  const Dictionary apart{{"k", 0}, {"k\uFFFD", 1}, {"k\uFFFD2", 3}, {"k\uFFFD3", 2}};
  const auto read = readXml(asBytes(*writeXml(clash)));
  EXPECT_EQ(*read, Value(apart));
  EXPECT_EQ(*writeXml(*read), *writeXml(clash));
}

TEST(Xml, RefusesToWriteWhatCouldNotBeReadBack) {
  Array deepest = Array{1};
  for (std::size_t i = 1; i < limits::kPropertyListDepth; ++i)
    deepest = Array{deepest};
  Array cyclic{1};
  cyclic.append(cyclic);
  // Better to write a log of many values than to lose it; the binary encoding limits them.
  Array wide{1, 2, 3, 4, 5, 6, 7, 8};
  for (int i = 0; i < 5; ++i)
    wide = Array{wide, wide, wide, wide, wide, wide, wide, wide};
  wide = Array{wide, wide, wide, wide};
  EXPECT_TRUE(writeXml(wide));
  EXPECT_EQ(writeBinary(wide).error().message,
            "cannot encode the property list: it has more than 1000000 values");
  Array large;
  const std::string text(std::size_t{1} << 20, '&');
  for (int i = 0; i < 14; ++i)
    large.append(text);

  const std::pair<Value, std::string> rows[] = {
      {Dictionary{{"a", Array{1, Value()}}},
       "cannot encode the property list, value /a/1: null has no encoding"},
      {Date::sinceEpoch(1e300),
       "cannot encode the property list, value /: the date is beyond any calendar"},
      {Value(cyclic),
       "cannot encode the property list: containers nest deeper than 128, or one contains itself"},
      {large, "cannot encode the property list: the document is longer than 67108864 bytes"}};
  for (const auto& [value, error] : rows)
    EXPECT_EQ(writeXml(value).error().message, error);
  cyclic.remove(1);
  EXPECT_EQ(*readXml(asBytes(*writeXml(deepest))), Value(deepest));
}

TEST(Xml, ReadsWhatOthersWrite) {
  const Dictionary expected{{"caf\xC3\xA9", Array{"<b>A", -31, Data(asBytes("abc")), 1.5, true}}};
  const std::string body =
      "<plist><!-- c --><dict><?x y?>\n<key>caf\xE9</key>\n<array><string><![CDATA[<b>]]>&#x41;"
      "</string><integer> -0x1F\n</integer>\n<data>\n\tYW\n\tJj </data><real> +1.50 </real><true> "
      "</true></array></dict></plist>";
  const std::string latin =
      "<?xml version='1.0' encoding='ISO-8859-1'?>"
      "<!DOCTYPE plist SYSTEM \"plist.dtd\" [<!ELEMENT plist ANY>]>" +
      body;
  std::string utf16 = "\xFF\xFE";
  for (const char character : body)
    utf16 += {character, '\0'};
  for (const std::string& document : {latin, utf16})
    EXPECT_EQ(*readXml(asBytes(document)), Value(expected));
  const auto twice = readXml(asBytes(wrapped(
      "<dict><key>a</key><true/><key>a</key><integer>9223372036854775808</integer></dict>")));
  EXPECT_EQ(*twice, Value(Dictionary{{"a", std::uint64_t{1} << 63}}));
  EXPECT_EQ(twice->dictionary().number("a")->kind(), NumberKind::UInt64);
}

TEST(Xml, ErrorsSayWhatAndWhere) {
  const std::pair<std::string, std::string> rows[] = {
      {"", "1: <plist> contains no value"},
      {"<true/><true/>", "8: <true> is a second value"},
      {"<key>a</key>", "1: <key> found outside <dict>"},
      {"<dict><key>a</key></dict>", "19: the last <key> of a <dict> has no value"},
      {"<dict><key>a</key><key>b</key></dict>",
       "19: <key> found where the value of a key should be"},
      {"<string>a<true/></string>", "10: <true> found where only text may be"},
      {"<array>x</array>", "8: text found outside an element that contains text"},
      {"<integer>--1</integer>", "13: \"--1\" is not a 64-bit integer"},
      {"<integer>" + std::string(59, '9') + "\xC3\xA9</integer>",
       "70: \"" + std::string(59, '9') + "...\" is not a 64-bit integer"},
      {"<integer>18446744073709551616</integer>",
       "30: \"18446744073709551616\" is not a 64-bit integer"},
      {"<real>1e999</real>", "12: \"1e999\" is not a number in the range of a double"},
      {"<date>2026-02-29T00:00:00Z</date>",
       "27: \"2026-02-29T00:00:00Z\" is not a date: give one that exists, as YYYY-MM-DDTHH:MM:SSZ"},
      {"<data>YQ==YQ==</data>", "15: the text of <data> is not base64"}};
  for (const auto& [body, reason] : rows)
    EXPECT_EQ(errorOf(wrapped(body)), "XML property list, line 3, column " + reason) << body;
  EXPECT_EQ(errorOf(wrapped("<integer>\n1\t\"2\"</integer>")),
            "XML property list, line 4, column 6: \"\\n1\\t\\\"2\\\"\" is not a 64-bit integer");
  EXPECT_EQ(errorOf("<dict/>"),
            "XML property list, line 1, column 1: <dict> found where <plist> should be");
  EXPECT_EQ(errorOf("<!DOCTYPE p [<!ENTITY a \"b\">]><plist><string>&a;</string></plist>"),
            "XML property list, line 1, column 25: entity \"a\" is declared; a property list may "
            "declare none");
  std::string deep;
  for (int i = 0; i < 129; ++i)
    deep += "<array>";
  EXPECT_EQ(errorOf(wrapped(deep)),
            "XML property list, line 3, column 897: containers nest deeper than 128");
  std::string wide = "<array>";
  for (std::size_t i = 0; i < limits::kPropertyListValues; ++i)
    wide += "<true/>";
  EXPECT_EQ(errorOf(wrapped(wide)),
            "XML property list, line 3, column 7000001: there are more than 1000000 values");
}

}  // namespace
}  // namespace tavrel::plist
