#include <cstdint>

#include "storage/structured_lists.h"
#include "storage/structured_record_type.h"

namespace tavrel {
namespace {

// Header: 4 ignored bytes, the number of bad blocks found by the factory, and the number of the
// following defects (32 bits each).
constexpr std::uint64_t kFactoryCount = 4;
constexpr std::uint64_t kDefectCount = 8;
constexpr std::uint64_t kHeaderBytes = 12;

constexpr std::uint64_t kDefectBytes = 28;
constexpr std::uint64_t kTemperature = 24;  // signed, 8 bits; the last 3 bytes are ignored

struct Field {
  const char* key;
  std::uint64_t offset;
};
constexpr Field kShortFields[] = {{"Bus", 0}, {"CE", 2}};  // 16 bits
constexpr Field kFields[] = {                              // 32 bits
    {"CAU", 4},
    {"Block", 8},
    {"Cycle", 12},
    {"Reason", 16},
    {"Page", 20}};

plist::Dictionary recordOf(ByteSpan defect) {
  plist::Dictionary record = plist::Dictionary::create(8);
  for (const Field& field : kShortFields)
    record.set(field.key, *loadLittle16(defect, field.offset));
  for (const Field& field : kFields)
    record.set(field.key, static_cast<std::int32_t>(*loadLittle32(defect, field.offset)));
  record.set("Temperature", static_cast<std::int8_t>(*loadByte(defect, kTemperature)));
  return record;
}

}  // namespace

bool logDefectsList(Platform& platform, ByteSpan buffer, const plist::Value&) {
  const auto factoryCount = loadLittle32(buffer, kFactoryCount);
  if (!factoryCount) return true;
  CrashReporting& records = platform.crashReporting;
  records.FLLogStructuredData(kStorageRecordType,
                              {{"Factory Count", static_cast<std::int32_t>(*factoryCount)}});
  const std::uint64_t defects = loadLittle32(buffer, kDefectCount).value_or(0);
  for (std::uint64_t i = 0; i < defects; ++i) {
    const auto defect = slice(buffer, kHeaderBytes + i * kDefectBytes, kDefectBytes);
    if (!defect) break;
    records.FLLogStructuredData(kStorageRecordType, recordOf(*defect));
  }
  return true;
}

}  // namespace tavrel
