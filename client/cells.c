#include "internal.h"

static uint64_t startOfNow(void) {
  const uint64_t now = bhSeconds(CLOCK_REALTIME_COARSE);
  if (bhIsCredible(now)) return now - now % kBHSecondsPerDay;
  return kBHUndated | bhSeconds(CLOCK_BOOTTIME);
}

static bool isClosed(uint32_t closes) {
  return closes % 2 != 0;
}

/* Closes a cell that is no longer used. The number is new each time, so that the acknowledgement of
 * an earlier close does not cover later adds. */
static void closeCell(struct Cell* cell) {
  uint32_t closes = atomic_load(&cell->closes);
  while (!atomic_compare_exchange_weak(&cell->closes, &closes, (closes + 1) | 1)) {
  }
}

/* False when the cell was given another start in the meantime. */
static bool reopen(struct Cell* cell, uint64_t start) {
  uint32_t closes = atomic_load(&cell->closes);
  while (isClosed(closes)) {
    if (atomic_compare_exchange_weak(&cell->closes, &closes, closes + 1)) break;
  }
  return atomic_load(&cell->start) == start;
}

static bool reuse(struct Key* key, struct Cell* cell, uint64_t start) {
  uint32_t closes = atomic_load(&cell->closes);
  if (!isClosed(closes) || atomic_load(&cell->acknowledged) != closes) return false;
  if (cell == atomic_load(&key->cell)) return false;
  if (!atomic_compare_exchange_strong(&cell->closes, &closes, closes + 1)) return false;
  atomic_store(&cell->start, start);
  return true;
}

/* A cell of the key for `start`: an existing one, or an acknowledged one that is reused. */
static struct Cell* findKnown(struct State* state, struct Segment* segment, struct Key* key,
                              uint32_t newest, uint64_t start) {
  for (uint32_t number = newest; number != 0; number = atomic_load(&state->older[number - 1])) {
    struct Cell* cell = &segment->cells[number - 1];
    if (atomic_load(&cell->start) == start && reopen(cell, start)) return cell;
  }
  for (uint32_t number = newest; number != 0; number = atomic_load(&state->older[number - 1])) {
    struct Cell* cell = &segment->cells[number - 1];
    if (reuse(key, cell, start)) return cell;
  }
  return NULL;
}

/* The number of a cell that has never been used; 0 when there is none. A cell serves one key for
 * ever. Undated values need a cell per second, so a part is kept from them: enough for a dated cell
 * of every key. */
static uint32_t takeCell(struct Process* process, struct Segment* segment, uint64_t start) {
  const uint32_t limit = (start & kBHUndated) ? kBHCellCount - kBHKeys : kBHCellCount;
  uint32_t used = atomic_load(&segment->cellsUsed);
  do {
    if (used >= kBHCellCount * 3 / 4) bhAskForFold(process, false);
    if (used >= limit || !bhFetch(&segment->cells[used], sizeof(struct Cell))) return 0;
  } while (!atomic_compare_exchange_weak(&segment->cellsUsed, &used, used + 1));
  return used + 1;
}

static struct Cell* findOrMake(struct Process* process, struct Segment* segment, struct Key* key,
                               uint64_t start) {
  struct State* state = process->state;
  uint32_t made = 0;
  for (;;) {
    uint32_t newest = atomic_load(&key->newestCell);
    struct Cell* known = findKnown(state, segment, key, newest, start);
    if (known) return known;

    const uint32_t keyNumber = bhNameKey(process, segment, key);
    if (made == 0 && keyNumber != 0) made = takeCell(process, segment, start);
    if (made == 0) return NULL;
    struct Cell* cell = &segment->cells[made - 1];
    atomic_store(&cell->start, start);
    atomic_store(&cell->key, keyNumber);
    atomic_store(&state->older[made - 1], (uint16_t)newest);
    if (atomic_compare_exchange_strong(&key->newestCell, &newest, made)) return cell;
  }
}

static struct Cell* currentCell(struct Process* process, struct Segment* segment, struct Key* key) {
  const uint64_t start = startOfNow();
  struct Cell* cell = atomic_load_explicit(&key->cell, memory_order_acquire);
  if (cell && atomic_load(&cell->start) == start) return cell;
  cell = findOrMake(process, segment, key, start);
  /* Closed also when there is no other: after a fold, the key has at least this one. */
  struct Cell* left = atomic_exchange(&key->cell, cell);
  if (left && left != cell) closeCell(left);
  _Atomic int* lack = &process->state->lacksCells;
  if (cell) {
    atomic_store_explicit(lack, 0, memory_order_relaxed);
  } else {
    bhDrop(process, segment, lack);
  }
  return cell;
}

struct Cell* bhFindCell(struct Key* key) {
  struct Process* process = bhProcess();
  if (!bhIsKey(process, key)) return NULL;
  struct Segment* segment = bhSegment(process);
  if (!segment) return NULL;
  bhNoticeFold(process, segment);
  struct Cell* cell = currentCell(process, segment, key);
  bhForgetInterrupted(process, segment);
  return cell;
}
