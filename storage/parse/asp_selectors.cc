#include "storage/parse/asp_selectors.h"

namespace tavrel {

const SelectorTable* ASPGetStatsSelectors() {
  return &statsSelector;
}
const SelectorTable* ASPGetBandStatsSelectors() {
  return &bandStatsSelector;
}
const SelectorTable* ASPGetDefectsListSelectors() {
  return &defectsListSelector;
}
const SelectorTable* ASPGetTelemetryListSelectors() {
  return &telemetryListSelectors;
}
const SelectorTable* ASPGetTaskSchedulerSelectors() {
  return &taskSchedulerSelectors;
}
const SelectorTable* ASPGetSnapshotSelectors() {
  return &snapshotSelectors;
}
const SelectorTable* ASPGetSnapshotHeaderSelectors() {
  return &snapshotHeaderSelectors;
}

}  // namespace tavrel
