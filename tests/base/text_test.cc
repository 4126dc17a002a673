#include "base/text.h"

#include <cfloat>
#include <cmath>
#include <cstdlib>
#include <gtest/gtest.h>
#include <random>
#include <string>

#include "base/civil_time.h"
#include "base/parse_number.h"
#include "base/quantity_text.h"
#include "base/utf8.h"
#include "base/uuid.h"

namespace tavrel {
namespace {

TEST(Text, WritesNumbersSoThatTheyReadBack) {
  using Case = std::pair<plist::Number, const char*>;
  for (const auto& [number, text] :
       {Case(0.1, "0.1"), Case(1e22, "1e+22"), Case(1e-5, "1e-05"), Case(-0.0, "-0"),
        Case(DBL_MAX, "1.7976931348623157e+308"), Case(4.9e-324, "5e-324"), Case(-INFINITY, "-inf"),
        Case(std::copysign(NAN, -1.0), "nan"), Case(INT64_MIN, "-9223372036854775808"),
        Case(UINT64_MAX, "18446744073709551615")})
    EXPECT_EQ(numberText(number), text);
  std::mt19937_64 random(3);
  for (int i = 0; i < 10000; ++i) {
    const double value = std::bit_cast<double>(random());
    EXPECT_EQ(plist::Number(std::strtod(numberText(value).c_str(), nullptr)), plist::Number(value));
  }
}

TEST(Text, WritesObjectsAsPeopleReadThem) {
  const auto moment = plist::Date::since1970(1794852138.75);
  const plist::Array others{
      plist::Array::create(),      true, false, moment, plist::Data(asBytes("\x0a\xf0")),
      plist::Dictionary::create(), NAN};
  const plist::Dictionary all{{"text", "a\"b\\c\n\r\t\x01\x7f\xc3\xa4\xff"}, {"others", others}};
  EXPECT_EQ(textOf(all),
            R"({"text": "a\"b\\c\n\r\t\u0001\u007f)"
            "\xc3\xa4\xef\xbf\xbd"
            R"(", "others": [[], 1, 0, "2026-11-16 18:02:18 +0000", "<0af0>", {}, nan]})");
  EXPECT_EQ(textOf("plain \"text\"\n"), "plain \"text\"\n");
  EXPECT_EQ(dateText(plist::Date::since1970(-0.5)), "1969-12-31 23:59:59 +0000");
  EXPECT_EQ(dateText(plist::Date::sinceEpoch(800'000'000.9999999)), "2026-05-09 06:13:20 +0000");
  EXPECT_EQ(dateText(plist::Date::since1970(-1e300)), "@-1e+300");
  EXPECT_EQ(textOf(plist::Data(ByteSpan())), "<>");
  EXPECT_EQ(textOf({}), "(null)");
}

TEST(Utf8, KnowsWhatChangesTheDirectionOfText) {
  std::u32string found;
  for (char32_t codePoint = 0; codePoint <= 0xFFFF; ++codePoint)
    if (changesDirection(codePoint)) found += codePoint;
  EXPECT_EQ(found, U"\u061C\u200E\u200F\u202A\u202B\u202C\u202D\u202E\u2066\u2067\u2068\u2069");
}

TEST(ParseNumber, TakesTextsThatAreNothingElse) {
  EXPECT_EQ(parseNumber<std::int8_t>("-128"), -128);
  EXPECT_EQ(parseNumber<std::uint8_t>("0255"), 255);
  EXPECT_EQ(parseNumber<unsigned>("fF", 16), 255U);
  EXPECT_EQ(parseNumber<double>("-2.5e-1"), -0.25);
  EXPECT_EQ(parseNumber<double>("inf"), INFINITY);
  for (const char* text : {"", "-", "+1", " 1", "1 ", "1x", "0x1", "-129", "128"})
    EXPECT_EQ(parseNumber<std::int8_t>(text), std::nullopt) << text;
  EXPECT_EQ(parseNumber<unsigned>("-1"), std::nullopt);
  for (const char* text : {"", "+1", "1e", "0x1", "1e999"})
    EXPECT_EQ(parseNumber<double>(text), std::nullopt) << text;
}

TEST(CivilTime, EveryDayOf32BitsHasADate) {
  const std::tuple<std::int64_t, CivilDate, const char*> cases[] = {
      {11016, {2000, 2, 29}, "2000-02-29"},
      {-719529, {-1, 12, 31}, "-0001-12-31"},
      {2932897, {10000, 1, 1}, "10000-01-01"},
      {365241780837, {1'000'000'000, 12, 31}, "1000000000-12-31"},
      {INT32_MAX, {5881580, 7, 11}, "5881580-07-11"},
      {INT32_MIN, {-5877641, 6, 23}, "-5877641-06-23"}};
  for (const auto& [day, date, text] : cases) {
    EXPECT_EQ(civilFromDays(day), date) << text;
    EXPECT_EQ(daysFromCivil(date), day) << text;
    EXPECT_EQ(dateText(date), text);
    EXPECT_EQ(parseDate(text), date);
  }
  CivilDate before = civilFromDays(INT32_MIN - std::int64_t{1});
  for (std::int64_t day = INT32_MIN; day <= INT32_MAX; day += day % 97 == 0 ? 1 : 49999) {
    const CivilDate date = civilFromDays(day);
    ASSERT_TRUE(isValid(date)) << day;
    ASSERT_EQ(daysFromCivil(date), day);
    ASSERT_GE(date.year, before.year);
    before = date;
  }
  for (const char* text : {"", "2026-2-03", "2026-02-30", "1900-02-29", "2026-13-01", "2026-01-00",
                           "2026-01-+1", "+2026-01-01", "2026-01-01 ", "02026-01-01", "-0000-01-01",
                           "1000000001-01-01", "99999999999-01-01"})
    EXPECT_FALSE(parseDate(text)) << text;
}

TEST(CivilTime, EveryInstantOf64BitsHasFields) {
  for (const std::int64_t seconds : {INT64_MIN, INT64_MIN + 86400, std::int64_t{-86401},
                                     std::int64_t{-1}, std::int64_t{86399}, INT64_MAX}) {
    const CivilTime time = civilFromSeconds(seconds);
    EXPECT_TRUE(time.hour < 24 && time.minute < 60 && time.second < 60) << seconds;
    EXPECT_EQ(secondsFromCivil(time), seconds);
  }
  EXPECT_EQ(civilFromSeconds(-1), (CivilTime{{1969, 12, 31}, 23, 59, 59}));
}

TEST(Utf8, TellsWellFormedFromMalformed) {
  // Two overlong forms, a surrogate, a truncated one, beyond U+10FFFF.
  using Case = std::pair<std::string_view, std::string_view>;
  for (const auto& [text, repaired] :
       {Case("\xC0\xAF", "\uFFFD\uFFFD"), Case("\xE0\x9F\xBF", "\uFFFD\uFFFD\uFFFD"),
        Case("\xED\xA0\x80", "\uFFFD\uFFFD\uFFFD"), Case("\xE2\x82", "\uFFFD\uFFFD"),
        Case("\xF4\x90\x80\x80", "\uFFFD\uFFFD\uFFFD\uFFFD")}) {
    EXPECT_FALSE(isValidUtf8(text)) << repaired;
    EXPECT_EQ(repairedUtf8(text), repaired);
  }
  for (char32_t codePoint = 0; codePoint <= 0x110000; ++codePoint) {
    const bool exists = codePoint <= 0x10FFFF && (codePoint < 0xD800 || codePoint > 0xDFFF);
    std::string text;
    appendCodePoint(text, codePoint);
    ASSERT_TRUE(isValidUtf8(text)) << std::hex << static_cast<unsigned>(codePoint);
    std::string_view rest = text;
    ASSERT_EQ(takeCodePoint(rest), exists ? codePoint : kReplacementCharacter);
    ASSERT_TRUE(rest.empty());
  }
}

TEST(UuidTest, WritesAndNormalises) {
  UuidBytes bytes;
  for (std::size_t i = 0; i < bytes.size(); ++i)
    bytes[i] = static_cast<std::byte>(i * 0x11);
  const std::string text = "00112233-4455-6677-8899-AABBCCDDEEFF";
  EXPECT_EQ(uuidText(bytes), text);
  EXPECT_EQ(normalisedUuid("00112233-4455-6677-8899-aabbccddeeff"), text);
  for (const char* other :
       {"", "00112233-4455-6677-8899-aabbccddeef", "00112233+4455-6677-8899-aabbccddeeff",
        "0011223g-4455-6677-8899-aabbccddeeff", "00112233-4455-6677-8899aabb-ccddeeff"})
    EXPECT_EQ(normalisedUuid(other), std::nullopt) << other;
}

TEST(Quantities, AreInTheUnitsThatPeopleKnow) {
  std::string quantities, sizes, ages;
  for (const auto& [value, unit] :
       {std::pair(41.25, "°C"), std::pair(-0.125, "°C"), std::pair(0.0, "s"),
        std::pair(12345e-9, "s"), std::pair(0.25, "s"), std::pair(119.97, "s"),
        std::pair(123456.0, "s"), std::pair(2.4e9, "Hz"), std::pair(1e-13, "F"),
        std::pair(999.6, "Hz"), std::pair(0.0009997, "V"), std::pair(999.6, "s")})
    quantities += quantityText(value, unit) + "; ";
  EXPECT_EQ(quantities,
            "41.3 °C; -0.125 °C; 0 s; 12.3 µs; 250 ms; 120 s; 123456 s; 2.4 GHz; 0.1 pF; "
            "1 kHz; 1 mV; 1000 s; ");
  for (const double bytes : {0.0, 1.0, 1023.0, 1024.0, 1536.0, 1048570.0, -2048.0, 0x1p63})
    sizes += sizeText(bytes) + "; ";
  EXPECT_EQ(sizes, "0 bytes; 1 byte; 1023 bytes; 1.0 KiB; 1.5 KiB; 1.0 MiB; -2.0 KiB; 8.0 EiB; ");
  for (const int seconds : {119, 120, 7199, 7200, 172'799, 172'800})
    ages += ageText(seconds) + "; ";
  EXPECT_EQ(ages, "119 s; 2 min; 119 min; 2 h; 47 h; 2 days; ");
  EXPECT_EQ(percentText(0.0908), "9.1 %");
}

}  // namespace
}  // namespace tavrel
