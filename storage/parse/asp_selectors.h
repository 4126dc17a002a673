// The selector numbers of the storage driver's lists.
//
// A list is fetched in two steps, each with a selector number of its own: one asks for the size in
// bytes, the other for the content.
#pragma once

#include <cstdint>

namespace tavrel {

struct SelectorTable {
  std::uint32_t sizeQuery;
  std::uint32_t fetch;
};

inline constexpr SelectorTable statsSelector{13, 13};
inline constexpr SelectorTable bandStatsSelector{11, 11};
inline constexpr SelectorTable defectsListSelector{15, 15};
inline constexpr SelectorTable telemetryListSelectors{17, 17};
inline constexpr SelectorTable taskSchedulerSelectors{39, 39};
inline constexpr SelectorTable snapshotSelectors{22, 22};
inline constexpr SelectorTable snapshotHeaderSelectors{145, 145};

/// The tables are constants. A getter for another kind of driver may return null, when that driver
/// has no such list.
using SelectorGetter = const SelectorTable* (*)();

const SelectorTable* ASPGetStatsSelectors();
const SelectorTable* ASPGetBandStatsSelectors();
const SelectorTable* ASPGetDefectsListSelectors();
const SelectorTable* ASPGetTelemetryListSelectors();
const SelectorTable* ASPGetTaskSchedulerSelectors();
const SelectorTable* ASPGetSnapshotSelectors();
const SelectorTable* ASPGetSnapshotHeaderSelectors();

}  // namespace tavrel
