#include "record.h"

/* The current cell, until its day ends. Undated cells never qualify: their start is in the far
 * future. */
static inline struct Cell* cellOfToday(struct Key* key) {
  struct Cell* cell = atomic_load_explicit(&key->cell, memory_order_acquire);
  if (!cell) return NULL;
  const uint64_t start = atomic_load_explicit(&cell->start, memory_order_relaxed);
  return bhSeconds(CLOCK_REALTIME_COARSE) - start < kBHSecondsPerDay ? cell : NULL;
}

static struct Cell* cellFor(struct Key* key) {
  const int error = errno;
  struct Cell* cell = bhFindCell(key);
  errno = error;
  return cell;
}

void BHClientScalarAdd(BHClientScalarKey* handle, int64_t amount) {
  struct Key* key = (struct Key*)handle;
  if (!key) return;
  struct Cell* cell = cellOfToday(key);
  if (!cell) cell = cellFor(key);
  if (!cell) return;
  /* A set between these two lines replaces the add; after two sets, the add comes on top. */
  const uint64_t sets = atomic_load_explicit(&cell->sets, memory_order_acquire);
  atomic_fetch_add_explicit(&cell->slots[sets % 2], amount, memory_order_relaxed);
}

static uint64_t timeOfSet(uint64_t start) {
  struct timespec now = {0};
  const uint64_t undated = start & kBHUndated;
  clock_gettime(undated ? CLOCK_BOOTTIME : CLOCK_REALTIME_COARSE, &now);
  return undated | ((uint64_t)now.tv_sec * 1000000000U + (uint64_t)now.tv_nsec);
}

void BHClientScalarSet(BHClientScalarKey* handle, int64_t value) {
  struct Key* key = (struct Key*)handle;
  if (!key) return;
  struct Cell* cell = cellOfToday(key);
  if (!cell) cell = cellFor(key);
  if (!cell) return;
  const uint64_t time = timeOfSet(atomic_load_explicit(&cell->start, memory_order_relaxed));
  uint64_t sets = atomic_load_explicit(&cell->sets, memory_order_acquire);
  do {
    atomic_store_explicit(&cell->slots[(sets + 1) % 2], value, memory_order_relaxed);
    atomic_store_explicit(&cell->times[(sets + 1) % 2], time, memory_order_relaxed);
  } while (!atomic_compare_exchange_weak_explicit(&cell->sets, &sets, sets + 1,
                                                  memory_order_release, memory_order_acquire));
}

void BHClientDistributionRecord(BHClientDistributionKey* handle, double value) {
  struct Key* key = (struct Key*)handle;
  if (!key) return;
  const uint32_t number = atomic_load_explicit(&key->number, memory_order_relaxed);
  struct Lane* lane = bhLane;
  if (number != 0 && lane) {
    const uint64_t now = bhSeconds(CLOCK_REALTIME_COARSE);
    struct Chunk* chunk = atomic_load_explicit(&lane->chunk, memory_order_acquire);
    if (chunk && bhIsCredible(now) && bhPut(chunk, value, bhMark(number, now))) return;
  }
  const int error = errno;
  bhRecordSlowly(key, value);
  errno = error;
}

static uint64_t monotonicNanoseconds(void) {
  struct timespec now = {0};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return (uint64_t)now.tv_sec * 1000000000U + (uint64_t)now.tv_nsec;
}

BHClientTimer BHClientTimerStart(void) {
  return (BHClientTimer){monotonicNanoseconds()};
}

void BHClientTimerStopSeconds(BHClientTimer timer, BHClientDistributionKey* key) {
  BHClientDistributionRecord(key, (double)(monotonicNanoseconds() - timer.nanoseconds) / 1e9);
}

void BHClientTimerStopMilliseconds(BHClientTimer timer, BHClientDistributionKey* key) {
  BHClientDistributionRecord(key, (double)(monotonicNanoseconds() - timer.nanoseconds) / 1e6);
}
