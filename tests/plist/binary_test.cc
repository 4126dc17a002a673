#include "platform/plist/binary.h"

#include <cmath>
#include <gtest/gtest.h>
#include <string>
#include <vector>

#include "base/format.h"
#include "platform/plist/coding.h"
#include "platform/plist/xml.h"

namespace tavrel::plist {
namespace {

using namespace std::string_literals;

// A document of objects given as bytes, with references of one byte and offsets of `offsetWidth`;
// the first object is the root, at offset 8.
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

std::string errorOf(const std::string& bytes) {
  const auto value = readBinary(asBytes(bytes));
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
  // Longer forms are read, too.
  EXPECT_EQ(*readBinary(asBytes(document({"\x12\0\0\0\7"s}))), Value(7));
  EXPECT_EQ(*readBinary(asBytes(document({"\x14"s + std::string(15, '\0') + '\7'}))), Value(7));
  EXPECT_EQ(*readBinary(asBytes(document({"\x14"s + std::string(15, '\xFF') + '\xFE'}))),
            Value(-2));
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
      {{"\x32\1\1\1\1"s}, "8: marker 0x32 is of an unknown type"},
      {{"\x15"s}, "8: an integer of more than 16 bytes"},
      {{"\x14\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF\1\0\0\0\0\0\0\0"s}, "8: an integer beyond 64 bits"},
      {{"\x21\0\0"s}, "8: a real of neither 4 nor 8 bytes"},
      {{"\x11\1"s}, "8: the object does not end before the table of offsets"},
      {{"\x62\0a\0"s}, "8: the object does not end before the table of offsets"},
      {{"\x4F\x13\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF"s},
       "8: the object does not end before the table of offsets"},
      {{"\x4F\x22\0\0\0\1"s}, "9: the length of an object is not an integer of 1 to 8 bytes"},
      {{"\xAF\x22\0\0\0\1"s}, "9: the length of an object is not an integer of 1 to 8 bytes"},
      {{"\xD1\1"s}, "8: the object does not end before the table of offsets"},
      {{"\x51\xE9"s}, "8: a byte of a text is not ASCII"},
      {{"\xA1\1"s}, "9: a reference to object 1, where there are 1"},
      {{"\xD1\1\1"s, "\x09"s}, "11: a key is not a string"},
      {{"\xA1\1"s, "\xD1\2\0"s, "\x51\x61"s}, "8: a container contains itself"},
      {expanding, "85: there are more than 1000000 values, after shared references are expanded"}};
  for (const auto& [objects, error] : rows)
    EXPECT_EQ(errorOf(document(objects)), "binary property list, offset " + error);

  // The maximum number of values: the root, 9 arrays, and all their elements.
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
      {16, "\0"s, "16: 0 is not a width from 1 to 8 bytes"},
      {16, "\x09", "16: 9 is not a width from 1 to 8 bytes"},
      {16, "\2"s, "18: the table of offsets has no room for 1 objects"},
      {18, "\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF"s,
       "18: the table of offsets has no room for 18446744073709551615 objects"},
      {26, "\0\0\0\0\0\0\0\1"s, "26: a reference to object 1, where there are 1"},
      {34, "\xFF\xFF\xFF\xFF\xFF\xFF\xFF\xFF"s,
       "34: the table of offsets begins at 18446744073709551615, outside the document"},
      {34, "\0\0\0\0\0\0\0\x0A"s, "18: the table of offsets has no room for 1 objects"},
      {9, "\x09"s, "9: object 0 is at offset 9, outside the objects"}};
  for (const auto& [at, change, error] : rows) {
    std::string bytes = good;
    bytes.replace(at, change.size(), change);
    EXPECT_EQ(errorOf(bytes), "binary property list, offset " + error);
  }
  for (std::size_t length = 8; length < good.size(); ++length)
    EXPECT_NE(errorOf(good.substr(0, length)), "no error") << length;
}

TEST(Binary, ContentThatIsReferredToManyTimesIsLimited) {
  // One mebibyte of data or text, referenced 65 times; the value of all keys is `false`.
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

}  // namespace
}  // namespace tavrel::plist
