#include "platform/plist/coding.h"

#include <cmath>
#include <gtest/gtest.h>
#include <limits>
#include <string>
#include <vector>

#include "base/format.h"
#include "base/limits.h"
#include "platform/plist/binary.h"
#include "platform/plist/xml.h"

namespace tavrel::plist {
namespace {

using namespace std::string_literals;

// A document of objects given as bytes, with references of one byte and offsets of some; the first
// object is the root and stands at offset 8.
std::string document(const std::vector<std::string>& objects, std::size_t offsetWidth = 1) {
  std::string out = "bplist00";
  const auto appendOffset = [&out](std::string& to, std::size_t width) {
    for (std::size_t i = width; i-- > 0;)
      to += static_cast<char>(out.size() >> (8 * i) & 0xFF);
  };
  std::string table;
  for (const std::string& object : objects) {
    appendOffset(table, offsetWidth);
    out += object;
  }
  std::string trailer = "\0\0\0\0\0\0"s + static_cast<char>(offsetWidth) + '\1';
  trailer += "\0\0\0\0\0\0\0"s + static_cast<char>(objects.size()) + std::string(8, '\0');
  appendOffset(trailer, 8);
  return out + table + trailer;
}

std::string errorOf(const std::string& bytes, Expected<Value> (*read)(ByteSpan) = readBinary) {
  const auto value = read(asBytes(bytes));
  return value ? "no error" : value.error().message;
}

TEST(Binary, SmallestFormsAreWrittenAndReadBack) {
  using Case = std::pair<Value, std::string>;
  for (const auto& [value, object] :
       {Case(true, "\x09"s), Case(std::int8_t{7}, "\x10\x07"s), Case(0xFF, "\x10\xFF"s),
        Case(256, "\x11\x01\x00"s), Case(0xFFFF, "\x11\xFF\xFF"s),
        Case(0xFFFFFFFF, "\x12\xFF\xFF\xFF\xFF"s),
        Case(std::uint64_t{1} << 63, "\x14\0\0\0\0\0\0\0\0\x80\0\0\0\0\0\0\0"s),
        Case(1.5F, "\x22\x3F\xC0\0\0"s), Case(-0.0, "\x23\x80\0\0\0\0\0\0\0"s),
        Case(Date::sinceEpoch(0.5), "\x33\x3F\xE0\0\0\0\0\0\0"s), Case("", "\x50"s),
        Case("fourteen chars", "\x5E\x66ourteen chars"s),
        Case("fifteen letters", "\x5F\x10\x0F\x66ifteen letters"s),
        Case("\xC3\xA9\xF0\x9F\x98\x80", "\x63\0\xE9\xD8\x3D\xDE\0"s),
        Case(Data(asBytes("\1\2\3")), "\x43\1\2\3"s), Case(Array::create(), "\xA0"s),
        Case(Dictionary::create(), "\xD0"s)}) {
    EXPECT_EQ(*writeBinary(value), document({object}));
    const auto back = readBinary(asBytes(document({object})));
    EXPECT_EQ(*back, value);
    if (const auto number = value.number(); number && number->isFloating()) {
      EXPECT_EQ(back->number()->kind(), number->kind());
      EXPECT_EQ(std::signbit(back->number()->real()), std::signbit(number->real()));
    }
  }
}

TEST(Binary, EqualScalarsAreOneObjectAndKeysAreSorted) {
  const Dictionary value{{"b", Array{1, std::int8_t{1}, "a", 1.0}}, {"a", 1}};
  EXPECT_EQ(*writeBinary(value), document({"\xD2\1\3\2\4"s, "\x51\x61"s, "\x10\1"s, "\x51\x62"s,
                                           "\xA4\2\2\1\5"s, "\x23\x3F\xF0\0\0\0\0\0\0"s}));
}

TEST(Binary, LargeDocumentsUseWiderReferences) {
  Dictionary large;
  for (int i = 0; i < 30'000; ++i)
    large.set(std::to_string(i), Array{i, std::to_string(i % 10)});
  EXPECT_EQ(*readBinary(asBytes(*writeBinary(large))), Value(large));
  EXPECT_EQ(*read(asBytes(*writeXml(large))), Value(large));
}

TEST(Binary, SharedContainersBecomeSeparateValues) {
  const auto value = readBinary(asBytes(document({"\xA2\1\1"s, "\xA1\2"s, "\x41x"s})));
  value->array().at(0).array().at(0).data().bytes()[0] = std::byte{'y'};
  EXPECT_EQ(*value, Value(Array{Array{Data(asBytes("y"))}, Array{Data(asBytes("x"))}}));
}

TEST(Binary, TextThatIsNotUnicodeIsRepaired) {
  EXPECT_EQ(*readBinary(asBytes(document({"\x63\xD8\0\0a\xDC\0"s}))), Value("\uFFFDa\uFFFD"));
  const Dictionary clash{{"k\xFF", 2}, {"k\xFE", 1}, {"\x01", 0}};
  EXPECT_EQ(*readBinary(asBytes(*writeBinary(clash))),
            Value(Dictionary{{"k\uFFFD", 1}, {"k\uFFFD2", 2}, {"\x01", 0}}));
}

TEST(Binary, RefusesToWriteCycles) {
  Dictionary cyclic{{"self", Dictionary{{"x", 1}}}};
  cyclic.dictionary("self").set("self", cyclic);
  EXPECT_EQ(writeBinary(cyclic).error().message,
            "cannot encode the property list: containers nest deeper than 128, or one contains "
            "itself");
  cyclic.remove("self");
}

TEST(Binary, HostileObjectsAreRefused) {
  std::vector<std::string> expanding{"\xAA\1\1\1\1\1\1\1\1\1\1"s};
  for (char i = 2; i < 9; ++i)
    expanding.push_back("\xAA"s + std::string(10, i));
  expanding.push_back("\x09"s);
  const std::pair<std::vector<std::string>, std::string> rows[] = {
      {{"\x32\1\1\1\1"s}, "8: marker 0x32 is of no type that is read"},
      {{"\x15"s}, "8: an integer of more than 16 bytes"},
      {{"\x14\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\1\0\0\0\0\0\0\0"s}, "8: an integer beyond 64 bits"},
      {{"\x21\0\0"s}, "8: a real of neither 4 nor 8 bytes"},
      {{"\x11\1"s}, "8: the object does not end before the table of offsets"},
      {{"\x62\0a\0"s}, "8: the object does not end before the table of offsets"},
      {{"\x4F\x13\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF"s},
       "8: the object does not end before the table of offsets"},
      {{"\x4F\x22\0\0\0\1"s}, "9: the length of an object is no integer of 1 to 8 bytes"},
      {{"\xD1\1"s}, "8: the object does not end before the table of offsets"},
      {{"\x51\xE9"s}, "8: a byte of a text is not ASCII"},
      {{"\xA1\1"s}, "9: a reference to object 1, where there are 1"},
      {{"\xD1\1\1"s, "\x09"s}, "11: a key is no text"},
      {{"\xA1\1"s, "\xD1\2\0"s, "\x51\x61"s}, "8: a container contains itself"},
      {expanding, "85: there are more than 1000000 values, after shared references are expanded"}};
  for (const auto& [objects, error] : rows)
    EXPECT_EQ(errorOf(document(objects)), "binary property list, offset " + error);

  // As many values as there may be: the root, 9 arrays, and all that is in them.
  const std::string large = "\xAF\x12\x00\x01\xB2\x06"s + std::string(111'110, '\1');
  EXPECT_EQ(errorOf(document({"\xA9"s + std::string(9, '\2'), "\x09", large}, 4)), "no error");

  std::vector<std::string> nested;
  for (int i = 1; i < 129; ++i)
    nested.push_back("\xA1"s + static_cast<char>(i));
  nested.push_back("\xA0");
  EXPECT_EQ(errorOf(document(nested, 2)),
            "binary property list, offset 264: containers nest deeper than 128");
  nested.back() = "\x09";
  EXPECT_EQ(errorOf(document(nested, 2)), "no error");
}

TEST(Binary, HostileTrailersAreRefused) {
  const std::string good = document({"\x09"s});  // table at 9, trailer at 10
  ASSERT_EQ(errorOf(good), "no error");
  const std::tuple<std::size_t, std::string, std::string> rows[] = {
      {0, "bplist15", "0: it does not begin with \"bplist00\""},
      {16, "\0"s, "16: 0 is no width from 1 to 8 bytes"},
      {16, "\x09", "16: 9 is no width from 1 to 8 bytes"},
      {16, "\2"s, "18: the table of offsets has no room for 1 objects"},
      {18, "\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF"s,
       "18: the table of offsets has no room for 18446744073709551615 objects"},
      {26, "\0\0\0\0\0\0\0\1"s, "26: a reference to object 1, where there are 1"},
      {34, "\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF"s,
       "34: the table of offsets begins at 18446744073709551615, outside the document"},
      {34, "\0\0\0\0\0\0\0\x0A"s, "18: the table of offsets has no room for 1 objects"},
      {9, "\x09"s, "9: object 0 stands at offset 9, outside the objects"}};
  for (const auto& [at, change, error] : rows) {
    std::string bytes = good;
    bytes.replace(at, change.size(), change);
    EXPECT_EQ(errorOf(bytes), "binary property list, offset " + error);
  }
  for (std::size_t length = 8; length < good.size(); ++length)
    EXPECT_NE(errorOf(good.substr(0, length)), "no error") << length;
}

TEST(Binary, ContentThatIsReferredToManyTimesIsLimited) {
  // One mebibyte of data, or of text, referred to 65 times; the value of all keys is `false`.
  const std::string references(65, '\1');
  const std::tuple<std::string, char, int> rows[] = {
      {"\xAF\x10\x41" + references, '\x4F', 76},
      {"\xAF\x10\x41" + references, '\x5F', 76},
      {"\xDF\x10\x41" + references + std::string(65, '\2'), '\x5F', 75}};
  for (const auto& [root, marker, offset] : rows) {
    const std::string content =
        marker + "\x12\x00\x10\x00\x00"s + std::string(std::size_t{1} << 20, 'x');
    EXPECT_EQ(errorOf(document({root, content, "\x08"}, 4)),
              format("binary property list, offset %d: texts and data, after shared references "
                     "are expanded, are more than 67108864 bytes",
                     offset));
  }
  EXPECT_FALSE(writeBinary(Dictionary{{std::string(33 << 20, 'k'), std::string(33 << 20, 'k')}}));
}

TEST(Coding, RecognisesTheEncodingByContent) {
  PlistCoding coding;
  const Value value = Dictionary{{"a", Array{1, 2.5, "x"}}};
  const std::string xml = *coding.encodeXml(value);
  for (const std::string& bytes : {xml, "\xEF\xBB\xBF" + xml, *writeBinary(value)})
    EXPECT_EQ(*coding.decode(asBytes(bytes)), value);
  EXPECT_EQ(coding.decode({}).error().message, "not a property list: the document is empty");
  EXPECT_EQ(coding.decode(asBytes(" \n<html/>")).error().message,
            "XML property list, line 2, column 1: <html> is no element of property lists");
}

std::string wrapped(const std::string& body) {
  return "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n" + body +
         "</plist>\n";
}

std::string xmlErrorOf(const std::string& document) {
  return errorOf(document, readXml);
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
        Case(UINT64_MAX, "<integer>18446744073709551615</integer>"),
        Case(0.1F, "<real>0.10000000149011612</real>"), Case(-0.0, "<real>-0</real>"),
        Case(5e-324, "<real>5e-324</real>"),
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

  // Keys that become equal stay apart, also from a key that had the text before.
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
  // A log of many values is better written than lost; in binary they are limited.
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
       "cannot encode the property list, value /: no calendar reaches the date"},
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
      {"", "1: <plist> holds no value"},
      {"<true/><true/>", "8: <true> is a second value"},
      {"<key>a</key>", "1: <key> stands outside <dict>"},
      {"<dict><key>a</key></dict>", "19: the last <key> of a <dict> has no value"},
      {"<dict><key>a</key><key>b</key></dict>", "19: <key> stands where the value of a key should"},
      {"<string>a<true/></string>", "10: <true> stands where only text may"},
      {"<array>x</array>", "8: text stands outside an element that holds text"},
      {"<integer>--1</integer>", "13: \"--1\" is no integer of 64 bits"},
      {"<integer>" + std::string(59, '9') + "\xC3\xA9</integer>",
       "70: \"" + std::string(59, '9') + "...\" is no integer of 64 bits"},
      {"<integer>18446744073709551616</integer>",
       "30: \"18446744073709551616\" is no integer of 64 bits"},
      {"<real>1e999</real>", "12: \"1e999\" is no real number that a double holds"},
      {"<date>2026-02-29T00:00:00Z</date>",
       "27: \"2026-02-29T00:00:00Z\" is no date of the form YYYY-MM-DDTHH:MM:SSZ"},
      {"<data>YQ==YQ==</data>", "15: the text of <data> is not base64"}};
  for (const auto& [body, reason] : rows)
    EXPECT_EQ(xmlErrorOf(wrapped(body)), "XML property list, line 3, column " + reason) << body;
  EXPECT_EQ(xmlErrorOf(wrapped("<integer>\n1\t\"2\"</integer>")),
            "XML property list, line 4, column 6: \"\\n1\\t\\\"2\\\"\" is no integer of 64 bits");
  EXPECT_EQ(xmlErrorOf("<dict/>"),
            "XML property list, line 1, column 1: <dict> stands where <plist> should");
  EXPECT_EQ(xmlErrorOf("<!DOCTYPE p [<!ENTITY a \"b\">]><plist><string>&a;</string></plist>"),
            "XML property list, line 1, column 25: entity \"a\" is declared; a property list may "
            "declare none");
  std::string deep;
  for (int i = 0; i < 129; ++i)
    deep += "<array>";
  EXPECT_EQ(xmlErrorOf(wrapped(deep)),
            "XML property list, line 3, column 897: containers nest deeper than 128");
  std::string wide = "<array>";
  for (std::size_t i = 0; i < limits::kPropertyListValues; ++i)
    wide += "<true/>";
  EXPECT_EQ(xmlErrorOf(wrapped(wide)),
            "XML property list, line 3, column 7000001: there are more than 1000000 values");
}

}  // namespace
}  // namespace tavrel::plist
