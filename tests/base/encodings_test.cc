// Base64, ISO dates and hashes.
#include <gtest/gtest.h>

#include "base/base64.h"
#include "base/instant.h"
#include "base/iso_date.h"
#include "base/keyed_hash.h"

namespace tavrel {
namespace {

TEST(Base64, RefusesWrongLengthsAndPadding) {
  std::vector<std::byte> read;
  for (const std::string_view text :
       {"A", "AA", "AA=", "AAA", "A===", "AA==A", "AAAA=", "=", "A?=="})
    EXPECT_FALSE(readBase64(text, read)) << text;
  for (const std::size_t size : {0U, 1U, 2U, 3U, 4U, 255U}) {
    std::vector<std::byte> bytes(size);
    for (std::size_t i = 0; i < size; ++i)
      bytes[i] = static_cast<std::byte>(255 - i);
    std::string text = "\n ";
    appendBase64(text, bytes);
    text.insert(std::min<std::size_t>(text.size(), 3), "\n ");  // within a group
    EXPECT_TRUE(readBase64(text, read));
    EXPECT_EQ(read, bytes);
  }
}

TEST(Dates, AreReadAsTheyAreWritten) {
  EXPECT_EQ(dayOf(plist::Date::since1970(-0.5)), -1);
  for (const double seconds :
       {0.0, -1.5, -0.25, 1e-7, 978307200.125, -3e12, 253402300800.0, 1e15}) {
    const auto date = plist::Date::sinceEpoch(seconds);
    EXPECT_EQ(*parseIsoDate(isoDateText(date)), date) << isoDateText(date);
  }
  EXPECT_EQ(isoDateText(plist::Date::sinceEpoch(-1e-17)), "2001-01-01T00:00:00Z");
  for (const std::string_view text :
       {"", "2026-13-01", "2026-11-16T24:00:00Z", "2026-11-16T10:00:00", "2026-11-16T10:00:00.5.Z",
        "2026-11-16T10:00:00.-5Z", "2026-11-16T1:00:00Z", "@", "@x"})
    EXPECT_FALSE(parseIsoDate(text)) << text;
}

// Values from an implementation that agrees with Python's hash of bytes.
TEST(Hash, IsSipHash) {
  const HashKey key{0x0706050403020100, 0x0F0E0D0C0B0A0908};
  EXPECT_EQ(sipHash("", key), 0xABAC0158050FC4DC);
  EXPECT_EQ(sipHash("aaaaaaaa", key), 0x8FB9BDDF35C1D145);
  EXPECT_EQ(sipHash("abcdefghijklmnopqrstuvw", key), 0x276C7C401120195C);
  EXPECT_EQ(keyedHash("a"), keyedHash("a"));
  EXPECT_NE(keyedHash("a"), sipHash("a", {0, 0}));
}

}  // namespace
}  // namespace tavrel
