#include <algorithm>
#include <gtest/gtest.h>
#include <map>
#include <sstream>
#include <string>

#include "storage/vm_freezer.h"
#include "tests/fakes/fake_platform.h"

namespace tavrel {
namespace {

std::string item(std::uint32_t type, std::uint64_t flags, std::string_view payload,
                 std::size_t missing = 0) {
  std::string text(16, '\0');
  const auto header = std::as_writable_bytes(std::span(text));
  storeLittle32(header, 0, type);
  storeLittle32(header, 4, static_cast<std::uint32_t>(payload.size() + missing));
  storeLittle64(header, 8, flags);
  return text.append(payload);
}

// Items from words: "(1" and ")1" begin and end container 1, "nABC" is a thread name ("*" stands
// for a zero byte), "s7" are IO statistics, "-" those without the counter, "a" is an array item,
// "?" a truncated item, "." the end of the buffer, "x" an unfinished begin.
std::string items(const std::string& described) {
  std::istringstream stream(described);
  std::string out;
  for (std::string word; stream >> word;) {
    std::string rest = word.substr(1);
    const std::uint64_t number = std::strtoull(rest.c_str(), nullptr, 10);
    std::string counters(40, '\x7f');
    storeLittle64(std::as_writable_bytes(std::span(counters)), 24, number);
    std::replace(rest.begin(), rest.end(), '*', '\0');
    const std::map<char, std::string> kinds{{'(', item(0x13, number, "kind")},
                                            {')', item(0x14, number, "")},
                                            {'n', item(0x909, 0, rest)},
                                            {'s', item(0x901, 0, counters)},
                                            {'-', item(0x901, 0, counters.substr(0, 31))},
                                            {'a', item(0x2F, 1, item(0x13, 9, "kind"))},
                                            {'?', item(0x909, 0, "VM", 0xFFFFFFF0)},
                                            {'.', item(0xF19158ED, 0, "")},
                                            {'x', item(0x13, 9, "kin")}};
    out += kinds.at(word[0]);
  }
  return out;
}

TEST(VMFreezer, FindsTheThreadsWrites) {
  // The bytes written; empty for an error.
  using Case = std::pair<std::string_view, std::vector<const char*>>;
  const Case kCases[] = {
      {"123456", {"(1 (2 nVM_swapout s123456 )2 )1"}},
      {"18446744073709551615", {"(1 nVM_swapout s18446744073709551615 )1"}},
      {"1", {"(1 (3 nx )3 (2 nVM_swapout s1 )2 )1"}},
      {"8", {"nVM_swapout s5 )0 x a (1 nVM_swapout a s8 )1", "(1 )2 nVM_swapout s8"}},
      {"4", {"(1 (1 )1 nVM_swapout s4 )1"}},
      {"2", {"(1 nVM_swapout s1 s2"}},
      {"3", {"(1 n s3 )1"}},
      // A truncated item ends every level; the end of the buffer ends one.
      {"6", {"(1 (2 nother . nVM_swapout s6 )1"}},
      {"0",
       {"(1 nVM_swapout (2 nother ? )2 )1", "(1 s5 (2 nVM_swapout )2 )1",
        "(1 nVM_swapout (2 s9 )2 )1",
        "(1 nVM_swapout****************************************************** )1", "(1 nVM_s )1"}},
      {"",
       {"(1 nVM_swapout -", "(1 )1 (2 nVM_swapout )2", "(1 nVM_swapout nother )1",
        "(1 nVM_swapout1* )1", ". (1 nVM_swapout )1", ""}}};
  fakes::FakeSnapshots snapshots;
  const auto copied = [&] { return textOf(CopyVMFreezerNANDInfo(snapshots)); };
  const std::string error =
      R"({"com.norvane.NANDInfo.VMFreezer.Error": "1", "com.norvane.NANDInfo.VMFreezer.ErrorMessage": )"
      R"("Unable parse snapshot for VMFreezer NAND writes."})";
  for (const auto& [writes, descriptions] : kCases) {
    const std::string found =
        format("{\"com.norvane.NANDInfo.VMFreezer.NumPhysicalWrites\": %s}", writes);
    for (const char* const described : descriptions) {
      const std::string content = items(described);
      snapshots.content.assign(asBytes(content).begin(), asBytes(content).end());
      EXPECT_EQ(copied(), writes.empty() ? error : found) << described;
      EXPECT_EQ(snapshots.flags, 0x10000U);
    }
  }
  for (bool* step :
       {&snapshots.hasBuffer, &snapshots.captures, &snapshots.takesFlags, &snapshots.creates}) {
    *step = false;
    EXPECT_EQ(copied(), error);
  }
  EXPECT_EQ(snapshots.alive, 0);
}

TEST(VMFreezer, TellsWhereTheScanStoppedAtAnyDepth) {
  constexpr std::uint64_t kDepth = 100'000;
  std::string text;
  for (std::uint64_t i = 0; i < kDepth; ++i)
    text += item(0x13, i, "kind");
  text += items("nme s1");
  for (std::uint64_t i = kDepth; i-- > 0;)
    text += item(0x14, i, "");
  const ByteSpan bytes = asBytes(text);
  std::optional<ByteSpan> statistics = bytes;
  ByteSpan position;
  EXPECT_FALSE(getIOStatsWithThreadnameFromKCData(bytes, std::nullopt, statistics));
  EXPECT_FALSE(getIOStatsWithThreadnameFromKCDataHelper(bytes, "you", statistics, &position));
  EXPECT_EQ(position.size(), 16U);  // the end of the first container
  EXPECT_EQ(statistics->data(), bytes.data());
  EXPECT_TRUE(getIOStatsWithThreadnameFromKCDataHelper(bytes, "me", statistics, &position));
  EXPECT_EQ(position.size(), kDepth * 16);
  EXPECT_EQ(statistics->size(), 40U);
}

}  // namespace
}  // namespace tavrel
