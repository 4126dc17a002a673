/* The memory writes that make up a record. */
#ifndef BRIMHOLD_RECORD_H
#define BRIMHOLD_RECORD_H

#include <string.h>

#include "internal.h"

/* In the memory that every thread has from its start: the first access may be in a signal handler,
 * which must not allocate. */
#define BH_CLIENT_THREAD_LOCAL __attribute__((tls_model("initial-exec")))

/* The lane of this thread. Stays valid in children, where it is empty. */
extern _Thread_local struct Lane* bhLane BH_CLIENT_THREAD_LOCAL;

static inline uint64_t bhMark(uint32_t number, uint64_t time) {
  const uint64_t seconds = time & ((kBHUndated >> 16) - 1);
  return (time & kBHUndated) | seconds << 16 | number;
}

/* False when the chunk is full. */
static inline bool bhPut(struct Chunk* chunk, double value, uint64_t mark) {
  const uint64_t index = atomic_fetch_add_explicit(&chunk->reserved, 1, memory_order_acquire);
  if (index >= kBHChunkRecords) return false;
  uint64_t bits;
  memcpy(&bits, &value, sizeof bits);
  atomic_store_explicit(&chunk->records[index].value, bits, memory_order_relaxed);
  atomic_store_explicit(&chunk->records[index].mark, mark, memory_order_release);
  return true;
}

#endif
