#include "storage/vm_freezer.h"

#include <algorithm>
#include <cstdint>
#include <stack>

#include "storage/nand_info_keys.h"

namespace tavrel {
namespace {

constexpr std::string_view kFreezerThread = "VM_swapout";

constexpr std::size_t kItemHeaderBytes = 16;
constexpr std::size_t kContainerKindBytes = 4;
constexpr std::size_t kLongestName = 64;
constexpr std::uint64_t kPhysicalWrites = 24;  // in the IO statistics

constexpr std::uint32_t kContainerBegin = 0x13;
constexpr std::uint32_t kContainerEnd = 0x14;
constexpr std::uint32_t kIOStatistics = 0x901;
constexpr std::uint32_t kThreadName = 0x909;
constexpr std::uint32_t kBufferEnd = 0xF19158ED;

struct Item {
  std::uint32_t type;
  std::uint64_t flags;
  ByteSpan payload;
};

// The first of `items`; nothing when it is truncated.
std::optional<Item> frontItem(ByteSpan items) {
  if (items.size() < kItemHeaderBytes) return std::nullopt;
  const auto payload = slice(items, kItemHeaderBytes, *loadLittle32(items, 4));
  if (!payload) return std::nullopt;
  return Item{*loadLittle32(items, 0), *loadLittle64(items, 8), *payload};
}

// The state of a container whose end has not been reached.
struct Level {
  std::uint64_t identifier;
  ByteSpan statistics;   // data is null when there are none
  bool isNamed = false;  // the last thread name is the wanted one
};

bool beginsContainer(const Item& item) {
  return item.type == kContainerBegin && item.payload.size() >= kContainerKindBytes;
}

bool ends(const Level& level, const std::optional<Item>& item) {
  if (!item || item->type == kBufferEnd) return true;
  return item->type == kContainerEnd && item->flags == level.identifier;
}

// A name of full length has no zero byte; it must be the beginning of `name`.
bool isName(ByteSpan payload, std::string_view name) {
  const auto text = asText(payload.first(std::min(payload.size(), kLongestName)));
  const std::size_t end = text.find('\0');
  return end == std::string_view::npos ? name.starts_with(text) : text.substr(0, end) == name;
}

std::optional<std::uint64_t> freezerWrites(StackSnapshots& snapshots) {
  const auto snapshot = snapshots.create();
  if (!snapshot || !snapshot->setFlags(kStackSnapshotKeyCodedData) || !snapshot->capture()) {
    return std::nullopt;
  }
  const auto items = snapshot->buffer();
  std::optional<ByteSpan> statistics;
  if (!items || !getIOStatsWithThreadnameFromKCData(*items, kFreezerThread, statistics)) {
    return std::nullopt;
  }
  return statistics ? loadLittle64(*statistics, kPhysicalWrites) : 0;
}

}  // namespace

plist::Dictionary CopyVMFreezerNANDInfo(StackSnapshots& snapshots) {
  if (const auto writes = freezerWrites(snapshots)) {
    return {{kNANDInfoVMFreezerNumPhysicalWritesKey, *writes}};
  }
  return {{kNANDInfoVMFreezerErrorKey, "1"},
          {kNANDInfoVMFreezerErrorMessageKey, "Unable parse snapshot for VMFreezer NAND writes."}};
}

bool getIOStatsWithThreadnameFromKCData(ByteSpan items, std::optional<std::string_view> threadName,
                                        std::optional<ByteSpan>& ioStatistics) {
  return getIOStatsWithThreadnameFromKCDataHelper(items, threadName, ioStatistics, nullptr);
}

bool getIOStatsWithThreadnameFromKCDataHelper(ByteSpan items,
                                              std::optional<std::string_view> threadName,
                                              std::optional<ByteSpan>& ioStatistics,
                                              ByteSpan* position) {
  if (!threadName) return false;
  const std::string_view name = threadName->substr(0, threadName->find('\0'));
  // A stack of our own, not the call stack: the snapshot decides how deep containers nest.
  std::stack<Level> levels;
  for (ByteSpan rest = items;;) {
    const auto item = frontItem(rest);
    if (levels.empty() && (!item || item->type == kBufferEnd)) return false;
    if (!levels.empty() && ends(levels.top(), item)) {
      const Level level = levels.top();
      levels.pop();
      if (level.isNamed || levels.empty()) {
        if (position) *position = rest;
        if (!level.isNamed) return false;
        ioStatistics.reset();
        if (level.statistics.data()) ioStatistics = level.statistics;
        return true;
      }
      if (!item) continue;  // the end of `items` ends the outer levels too
    } else if (beginsContainer(*item)) {
      levels.push({.identifier = item->flags, .statistics = {}});
    } else if (!levels.empty() && item->type == kThreadName) {
      levels.top().isNamed = isName(item->payload, name);
    } else if (!levels.empty() && item->type == kIOStatistics) {
      levels.top().statistics = item->payload;
    }
    rest = rest.subspan(kItemHeaderBytes + item->payload.size());
  }
}

}  // namespace tavrel
