#include <array>
#include <cstdint>

#include "base/format.h"
#include "storage/nand_info.h"
#include "storage/parse/nand_log_writer.h"
#include "storage/structured_lists.h"
#include "storage/structured_log.h"

namespace tavrel {
namespace {

// Header: the numbers of records and of 8-byte items (32 bits each), 4 ignored bytes. The items are
// ignored; the records follow them.
constexpr std::uint64_t kRecordCount = 0;
constexpr std::uint64_t kItemCount = 4;
constexpr std::uint64_t kHeaderBytes = 12;
constexpr std::uint64_t kItemBytes = 8;

constexpr std::uint64_t kRecordBytes = 20;
constexpr std::uint64_t kRecordBucket = 0;  // unsigned, 32 bits
constexpr std::uint64_t kRecordValue = 4;   // signed, 32 bits

constexpr std::size_t kBuckets = 16;

}  // namespace

bool logValidityList(Platform& platform, ByteSpan buffer, const plist::Value&) {
  if (!gNeedValidityList) return true;

  const std::uint64_t count = loadLittle32(buffer, kRecordCount).value_or(0);
  const std::uint64_t items = loadLittle32(buffer, kItemCount).value_or(0);
  const std::uint64_t first = kHeaderBytes + items * kItemBytes;
  if (count == 0 || buffer.size() < first + count * kRecordBytes) {
    platform.standardStreams->writeError("data cannot be parsed");
    return false;
  }

  plist::Dictionary statistics{{"IntermediateWamp", gCurrentSysWamp},
                               {"UserWamp", gCurrentUserWamp}};
  DumpNANDInfo(platform, statistics);

  std::array<plist::Array, kBuckets> buckets;
  for (std::uint64_t i = 0; i < count; ++i) {
    const std::uint64_t record = first + i * kRecordBytes;
    const std::uint32_t bucket = *loadLittle32(buffer, record + kRecordBucket);
    if (bucket >= kBuckets) continue;
    buckets[bucket].append(static_cast<std::int32_t>(*loadLittle32(buffer, record + kRecordValue)));
  }
  for (std::size_t bucket = 0; bucket < kBuckets; ++bucket) {
    if (buckets[bucket]) statistics.set(format("ValidityList[%zu]", bucket), buckets[bucket]);
  }
  NLW_WriteLog(platform, "165", statistics);
  return true;
}

}  // namespace tavrel
