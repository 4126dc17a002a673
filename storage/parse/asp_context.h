// The content of a statistics buffer: a few fixed fields, and each recognised statistic by its
// name.
//
//   ASPContext context;
//   if (ASPParseBufferToCxt(context, buffer) != 0) {
//     forEachStatistic(context, [](std::string_view name, const ASPValueEntry& value) { ... });
//   }
//   ASPReleaseContext(context);
//
// A context begins empty, with all fields zero. It owns its entries, which keep their addresses
// until it is released or goes out of scope.
#pragma once

#include <array>
#include <cstdint>

#include "storage/parse/asp_entries.h"

namespace tavrel {

/// Entries in the order of the buffer. Head and tail are both set or both null.
template <class Entry>
struct ASPList {
  Entry* head = nullptr;
  Entry* tail = nullptr;
};

struct ASPContext {
  std::uint32_t exportVersion = 0;  // also 0 when a record of the buffer was bad
  std::uint32_t driverVersion = 0;  // all ones once a buffer was parsed
  std::uint32_t numVirtualBlocks = 0;
  std::uint32_t blocksPerVirtualBlock = 0;
  std::uint32_t pagesPerVirtualBlock = 0;
  std::uint32_t bytesPerPage = 0;
  std::uint64_t hostReads = 0;
  std::uint64_t hostWrites = 0;
  std::uint64_t numFreeVirtualBlocks = 0;
  std::uint64_t wearLevMoves = 0;
  std::uint64_t nandReads = 0;
  std::uint64_t nandWrites = 0;
  std::uint64_t bandErases = 0;
  std::uint64_t IND_pool_free = 0;
  std::uint64_t IND_pool_count = 0;
  std::uint64_t utilFormatTime = 0;  // seconds since 1970
  std::uint64_t numSleepOps = 0;
  std::uint64_t maxHighEnduranceBlockErases = 0;
  std::array<std::uint64_t, 5> readCountHisto{};

  // The lists are parallel: entry i of both describes the same statistic.
  ASPList<ASPNameEntry> names;
  ASPList<ASPValueEntry> values;

  /// Holds the entries of the lists.
  ASPEntryArena arena;
};

/// Calls `visit(name, value entry)` for each pair of entries, until either list ends.
template <class Visit>
void forEachStatistic(const ASPContext& context, Visit visit) {
  const ASPNameEntry* name = context.names.head;
  const ASPValueEntry* value = context.values.head;
  for (; name && value; name = name->next, value = value->next)
    visit(asText(name->name), *value);
}

}  // namespace tavrel
