#include "base/bytes.h"

#include <array>
#include <gtest/gtest.h>

#include "base/arithmetic.h"
#include "base/copy_little.h"

namespace tavrel {
namespace {

constexpr auto kMax64 = UINT64_MAX;

TEST(Bytes, LoadsOnlyWhatLiesInside) {
  const ByteSpan bytes = asBytes("\x01\x02\x03\x04\x05\x06\x07\xF8\x09");
  EXPECT_EQ(loadByte(bytes, 8), 0x09);
  EXPECT_EQ(loadLittle16(bytes, 7), 0x09F8);
  EXPECT_EQ(loadLittle32(bytes, 1), 0x05040302U);
  EXPECT_EQ(loadLittle64(bytes, 0), 0xF807060504030201U);
  for (const std::uint64_t beyond : {std::uint64_t{9}, kMax64 - 1, kMax64})
    EXPECT_FALSE(loadByte(bytes, beyond));
  EXPECT_FALSE(loadLittle16(bytes, 8) || loadLittle32(bytes, 6) || loadLittle64(bytes, 2));
  EXPECT_EQ(slice(bytes, 9, 0)->size(), 0U);
  EXPECT_EQ(asText(*slice(bytes, 0, 2)), "\x01\x02");
  EXPECT_FALSE(slice(bytes, 10, 0) || slice(bytes, 1, kMax64) || slice(bytes, 1, 9));
  double real = 0;
  copyLittle(&real, "\0\0\0\0\0\0\xF0\x3F", sizeof real);
  EXPECT_EQ(real, 1);
}

TEST(Bytes, StoresWhollyOrNotAtAll) {
  std::array<std::byte, 8> bytes{};
  EXPECT_TRUE(storeLittle16(bytes, 0, 0xABCD));
  EXPECT_TRUE(storeLittle32(bytes, 4, 0x01020304));
  EXPECT_EQ(loadLittle64(bytes, 0), 0x010203040000ABCDU);
  EXPECT_FALSE(storeLittle32(bytes, 5, 0) || storeLittle64(bytes, 1, 0) ||
               storeLittle16(bytes, kMax64, 0));
  EXPECT_EQ(loadLittle64(bytes, 0), 0x010203040000ABCDU);
  EXPECT_TRUE(storeLittle64(bytes, 0, 0x8070605040302010));
  EXPECT_EQ(loadLittle64(bytes, 0), 0x8070605040302010U);
}

TEST(Arithmetic, IsDefinedAtTheEnds) {
  EXPECT_EQ(wrappingAdd(INT64_MAX, 1), INT64_MIN);
  EXPECT_EQ(saturatingAdd(INT64_MAX, std::int64_t{1}), INT64_MAX);
  EXPECT_EQ(saturatingAdd(INT64_MIN, std::int64_t{-1}), INT64_MIN);
  EXPECT_EQ(saturatingAdd(kMax64 - 1, std::uint64_t{2}), kMax64);
  EXPECT_EQ(previousDay(INT32_MIN), INT32_MAX);
  EXPECT_EQ(shiftLeft(1, 64), 0U);
  constexpr std::uint64_t kTwoTo32 = std::uint64_t{1} << 32;
  EXPECT_EQ(checkedMultiply(kTwoTo32, kTwoTo32 - 1), kMax64 - kTwoTo32 + 1);
  EXPECT_FALSE(checkedMultiply(kTwoTo32, kTwoTo32));
  EXPECT_EQ(saturatingInt64(9223372036854774784.0), 9223372036854774784);
  EXPECT_EQ(saturatingInt64(-9223372036854775808.0), INT64_MIN);
}

}  // namespace
}  // namespace tavrel
