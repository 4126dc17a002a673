#include "storage/parse/asp_parser.h"

#include <algorithm>
#include <charconv>
#include <iterator>
#include <memory>

#include "base/bytes.h"
#include "storage/parse/statistic_keys.h"

namespace tavrel {
namespace {

constexpr std::size_t kUnitBytes = 8;
constexpr std::uint32_t kLargestValidKey = 0x30000000;
constexpr std::uint32_t kReadCountHistoKey = 265;

std::uint64_t unitAt(ByteSpan units, std::size_t index) {
  return loadLittle64(units, index * kUnitBytes).value_or(0);
}

// The fields that other parts of the system read without searching the lists.
void storeField(ASPContext& context, std::uint32_t key, std::uint64_t value) {
  const auto low = static_cast<std::uint32_t>(value);
  // clang-format off
  switch (key) {
    case 4: context.hostWrites = value; break;
    case 7: context.hostReads = value; break;
    case 12: context.IND_pool_free = value; break;
    case 13: context.IND_pool_count = value; break;
    case 17: context.wearLevMoves = value; break;
    case 18: context.nandWrites = value; break;
    case 19: context.nandReads = value; break;
    case 20: context.bandErases = value; break;
    case 28: context.numSleepOps = value; break;
    case 45: context.maxHighEnduranceBlockErases = value; break;
    case 48: context.numFreeVirtualBlocks = value; break;
    case 49: context.bytesPerPage = low; break;
    case 50: context.pagesPerVirtualBlock = low; break;
    case 51: context.blocksPerVirtualBlock = low; break;
    case 52: context.numVirtualBlocks = low; break;
    case 53: context.exportVersion = low; break;
    case 56: context.utilFormatTime = value; break;
    default: break;
  }
  // clang-format on
}

}  // namespace

bool ASPAppendEntry(ASPContext& context, std::string_view prefix, std::string_view suffix,
                    std::uint64_t value) {
  ASPEntryPair* const entries = context.arena.allocate();
  if (!entries) return false;

  char* at = entries->name.name.data();
  prefix = prefix.substr(0, kLongestASPText);
  suffix = suffix.substr(0, kLongestASPText - prefix.size());
  at = std::copy(prefix.begin(), prefix.end(), at);
  *std::copy(suffix.begin(), suffix.end(), at) = '\0';

  ASPText& text = entries->value.text;
  *std::to_chars(text.data(), text.data() + kLongestASPText, value).ptr = '\0';
  entries->value.value = value;

  entries->name.next = nullptr;
  entries->value.next = nullptr;
  if (context.names.tail && context.values.tail) {
    context.names.tail->next = &entries->name;
    context.values.tail->next = &entries->value;
  } else {
    context.names.head = &entries->name;
    context.values.head = &entries->value;
  }
  context.names.tail = &entries->name;
  context.values.tail = &entries->value;
  return true;
}

bool ASPRecordValues(ASPContext& context, std::uint32_t key, std::string_view name,
                     ByteSpan values) {
  const std::size_t count = values.size() / kUnitBytes;
  if (count == 0) return true;

  storeField(context, key, unitAt(values, 0));
  if (key == kReadCountHistoKey) {
    for (std::size_t i = 0; i < std::min(count, context.readCountHisto.size()); ++i)
      context.readCountHisto[i] = unitAt(values, i);
  }

  if (count == 1) return ASPAppendEntry(context, {}, name, unitAt(values, 0));
  for (std::size_t i = 0; i < count; ++i) {
    char digits[20];
    const char* const end = std::to_chars(digits, std::end(digits), i).ptr;
    const std::string_view index(digits, static_cast<std::size_t>(end - digits));
    if (!ASPAppendEntry(context, name, index, unitAt(values, i))) return false;
  }
  return true;
}

int ASPParseBufferToCxt(ASPContext& context, ByteSpan buffer) {
  context.driverVersion = 0xFFFFFFFF;
  std::size_t units = buffer.size() / kUnitBytes;
  if (units == 0) return 0;

  while (units > 0) {
    const std::uint64_t header = unitAt(buffer, 0);
    const auto key = static_cast<std::uint32_t>(header);
    const auto count = static_cast<std::uint32_t>(header >> 32);
    if (key > kLargestValidKey || count > units - 1) {
      context.exportVersion = 0;
      return 0;
    }
    if (const StatisticKey* const statistic = findStatisticKey(key)) {
      const std::size_t taken = std::min(count, statistic->cap);
      const ByteSpan values = buffer.subspan(kUnitBytes, taken * kUnitBytes);
      if (!ASPRecordValues(context, key, statistic->name, values)) return 0;
    }
    const std::size_t recordUnits = 1 + std::size_t{count};
    buffer = buffer.subspan(recordUnits * kUnitBytes);
    units -= recordUnits;
  }
  return 1;
}

void ASPReleaseContext(ASPContext& context) {
  std::destroy_at(&context);
  std::construct_at(&context);
}

}  // namespace tavrel
