#include <string.h>

#include "internal.h"
#include "record.h"

_Thread_local struct Lane* bhLane BH_CLIENT_THREAD_LOCAL;

static bool isReusable(struct Chunk* chunk) {
  const uint32_t generation = atomic_load_explicit(&chunk->generation, memory_order_relaxed);
  return generation != 0 && generation % 2 == 0 &&
         atomic_load_explicit(&chunk->acknowledged, memory_order_acquire) == generation;
}

static uint32_t usedChunks(struct Segment* segment) {
  const uint32_t used = atomic_load_explicit(&segment->chunksUsed, memory_order_acquire);
  return used < kBHChunkCount ? used : kBHChunkCount;
}

static int32_t freeChunks(struct State* state, struct Segment* segment) {
  return atomic_load_explicit(&state->reusableChunks, memory_order_relaxed) + kBHChunkCount -
         (int32_t)usedChunks(segment);
}

void bhNoticeFold(struct Process* process, struct Segment* segment) {
  struct State* state = process->state;
  const uint64_t folds = atomic_load_explicit(&segment->folds, memory_order_acquire);
  if (folds == atomic_load_explicit(&state->knownFolds, memory_order_relaxed)) return;
  int32_t reusable = 0;
  for (uint32_t i = 0; i < usedChunks(segment); ++i)
    reusable += isReusable(&segment->chunks[i]);
  atomic_store_explicit(&state->reusableChunks, reusable, memory_order_relaxed);
  atomic_store_explicit(&state->lacksChunks, 0, memory_order_relaxed);
  atomic_store_explicit(&state->lacksCells, 0, memory_order_relaxed);
  if (freeChunks(state, segment) >= kBHChunkCount / 2) {
    atomic_store_explicit(&state->hasFreedChunks, 1, memory_order_relaxed);
  }
  atomic_store_explicit(&state->knownFolds, folds, memory_order_relaxed);
}

/* A chunk whose records have been folded, emptied for reuse. */
static struct Chunk* takeReusable(struct State* state, struct Segment* segment) {
  if (atomic_load_explicit(&state->reusableChunks, memory_order_relaxed) <= 0) return NULL;
  const uint32_t used = usedChunks(segment);
  for (uint32_t tried = 0; tried < used; ++tried) {
    const uint32_t next =
        atomic_fetch_add_explicit(&state->nextReusable, 1, memory_order_relaxed) % used;
    struct Chunk* chunk = &segment->chunks[next];
    uint32_t generation = atomic_load_explicit(&chunk->generation, memory_order_relaxed);
    if (!isReusable(chunk) || generation % 2 != 0) continue;
    if (!atomic_compare_exchange_strong(&chunk->generation, &generation, generation + 1)) continue;
    /* Nobody writes records here now: those of the generation are marked, and late reservations lie
     * beyond the end, as only closed chunks are acknowledged. The count that lets writers in again
     * is reset last. */
    for (uint32_t i = 0; i < kBHChunkRecords; ++i)
      atomic_store_explicit(&chunk->records[i].mark, 0, memory_order_relaxed);
    atomic_store_explicit(&chunk->generation, generation + 2, memory_order_release);
    atomic_store_explicit(&chunk->reserved, 0, memory_order_release);
    atomic_fetch_sub_explicit(&state->reusableChunks, 1, memory_order_relaxed);
    return chunk;
  }
  atomic_store_explicit(&state->reusableChunks, 0, memory_order_relaxed);
  return NULL;
}

/* Allocates the memory of chunk `index`, and of some more chunks when the process records much. */
static bool fetchChunk(struct State* state, struct Segment* segment, uint32_t index) {
  uint32_t fetched = atomic_load_explicit(&state->fetchedChunks, memory_order_relaxed);
  if (index < fetched) return true;
  uint32_t ahead = index == 0 ? 1 : index;
  if (ahead > kLargestFetch) ahead = kLargestFetch;
  uint32_t end = index + ahead < kBHChunkCount ? index + ahead : kBHChunkCount;
  if (!bhFetch(&segment->chunks[fetched], (end - fetched) * sizeof(struct Chunk))) {
    end = index + 1;
    if (!bhFetch(&segment->chunks[fetched], (end - fetched) * sizeof(struct Chunk))) return false;
  }
  while (fetched < end && !atomic_compare_exchange_weak(&state->fetchedChunks, &fetched, end)) {
  }
  return true;
}

/* A chunk that has never been used. */
static struct Chunk* takeFresh(struct State* state, struct Segment* segment) {
  uint32_t used = atomic_load_explicit(&segment->chunksUsed, memory_order_relaxed);
  do {
    if (used >= kBHChunkCount || !fetchChunk(state, segment, used)) return NULL;
  } while (!atomic_compare_exchange_weak(&segment->chunksUsed, &used, used + 1));
  struct Chunk* chunk = &segment->chunks[used];
  atomic_store_explicit(&chunk->generation, 2, memory_order_release);
  return chunk;
}

static struct Chunk* takeChunk(struct Process* process, struct Segment* segment) {
  struct State* state = process->state;
  bhNoticeFold(process, segment);
  struct Chunk* chunk = atomic_exchange(&state->spareChunk, NULL);
  if (!chunk) chunk = takeReusable(state, segment);
  if (!chunk) chunk = takeFresh(state, segment);
  /* A program that fills a segment faster than it may ask is served as long as folds make room. */
  if (freeChunks(state, segment) < kBHChunkCount / 4) {
    bhAskForFold(process, atomic_exchange(&state->hasFreedChunks, 0));
  }
  if (chunk) atomic_store_explicit(&state->lacksChunks, 0, memory_order_relaxed);
  return chunk;
}

/* Keeps an empty chunk that was taken in vain for a lane. One becomes the spare chunk; an earlier
 * spare has nothing to fold, so it is acknowledged as if it had been folded. First it is closed,
 * as a full one is: a thread that found it in a lane, before it was folded and emptied, may be
 * about to record there. A chunk that has such a record stays as it is. */
static void keepEmpty(struct State* state, struct Chunk* chunk) {
  chunk = atomic_exchange(&state->spareChunk, chunk);
  uint64_t none = 0;
  if (!chunk || !atomic_compare_exchange_strong(&chunk->reserved, &none, kBHChunkRecords)) return;
  const uint32_t generation = atomic_load_explicit(&chunk->generation, memory_order_relaxed);
  atomic_store_explicit(&chunk->acknowledged, generation, memory_order_release);
  atomic_fetch_add_explicit(&state->reusableChunks, 1, memory_order_relaxed);
}

static struct Lane* laneOfThread(struct State* state) {
  if (!bhLane) {
    const uint32_t next = atomic_fetch_add_explicit(&state->nextLane, 1, memory_order_relaxed);
    bhLane = &state->lanes[next % kLanes];
  }
  return bhLane;
}

/* False when there is no room. */
static bool recordInto(struct Process* process, struct Segment* segment, struct Key* key,
                       double value) {
  uint64_t time = bhSeconds(CLOCK_REALTIME_COARSE);
  if (!bhIsCredible(time)) time = kBHUndated | bhSeconds(CLOCK_BOOTTIME);
  const uint32_t number = bhNameKey(process, segment, key);
  struct Lane* lane = laneOfThread(process->state);
  while (number != 0) {
    struct Chunk* chunk = atomic_load_explicit(&lane->chunk, memory_order_acquire);
    if (chunk && bhPut(chunk, value, bhMark(number, time))) return true;
    struct Chunk* fresh = takeChunk(process, segment);
    if (!fresh) break;
    if (!atomic_compare_exchange_strong(&lane->chunk, &chunk, fresh)) {
      keepEmpty(process->state, fresh);
    }
  }
  return false;
}

void bhRecordSlowly(struct Key* key, double value) {
  struct Process* process = bhProcess();
  if (!bhIsKey(process, key)) return;
  struct Segment* segment = bhSegment(process);
  if (!segment) return;
  if (!recordInto(process, segment, key, value)) {
    bhDrop(process, segment, &process->state->lacksChunks);
  }
  bhForgetInterrupted(process, segment);
}
