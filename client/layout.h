/* Structures for a mapped segment, and for the library's own memory. */
#ifndef BRIMHOLD_LAYOUT_H
#define BRIMHOLD_LAYOUT_H

#include <stdalign.h>
#include <stdatomic.h>
#include <stddef.h>
#include <stdint.h>

#include "limits.h"
#include "segment_format.h"

_Static_assert(ATOMIC_LLONG_LOCK_FREE == 2, "a shared mapping needs lock-free atomics");

struct Cell {
  _Atomic uint64_t start;
  _Atomic uint64_t sets;
  _Atomic int64_t slots[2];
  _Atomic uint64_t times[2];
  _Atomic uint32_t key;
  _Atomic uint32_t closes;
  _Atomic uint32_t acknowledged;
  uint32_t unused;
};

struct Record {
  _Atomic uint64_t value;
  _Atomic uint64_t mark;
};

struct Chunk {
  _Atomic uint64_t reserved;
  _Atomic uint32_t generation;
  _Atomic uint32_t acknowledged;
  struct Record records[kBHChunkRecords];
};

struct Segment {
  _Atomic uint64_t magic;
  uint32_t version;
  uint32_t pid;
  uint64_t bytes;
  unsigned char identity[16];
  unsigned char boot[16];
  uint64_t pidNamespace;
  uint64_t start;
  alignas(64) _Atomic uint32_t cellsUsed;
  _Atomic uint32_t chunksUsed;
  alignas(64) _Atomic uint64_t dropped;
  alignas(64) _Atomic uint64_t folds;
  alignas(4096) _Atomic uint64_t keys[kBHKeys];
  _Atomic char names[kBHNamesBytes];
  struct Cell cells[kBHCellCount];
  alignas(4096) struct Chunk chunks[kBHChunkCount];
};

_Static_assert(offsetof(struct Cell, slots) == kBHCellSlots, "");
_Static_assert(offsetof(struct Cell, times) == kBHCellTimes, "");
_Static_assert(offsetof(struct Cell, key) == kBHCellKey, "");
_Static_assert(offsetof(struct Cell, acknowledged) == kBHCellAcknowledged, "");
_Static_assert(sizeof(struct Cell) == kBHCellBytes, "");
_Static_assert(offsetof(struct Chunk, acknowledged) == kBHChunkAcknowledged, "");
_Static_assert(offsetof(struct Chunk, records) == kBHChunkFirst, "");
_Static_assert(sizeof(struct Chunk) == kBHChunkBytes, "");
_Static_assert(offsetof(struct Segment, identity) == kBHHeaderIdentity, "");
_Static_assert(offsetof(struct Segment, start) == kBHHeaderStart, "");
_Static_assert(offsetof(struct Segment, cellsUsed) == kBHHeaderCellsUsed, "");
_Static_assert(offsetof(struct Segment, chunksUsed) == kBHHeaderChunksUsed, "");
_Static_assert(offsetof(struct Segment, dropped) == kBHHeaderDropped, "");
_Static_assert(offsetof(struct Segment, folds) == kBHHeaderFolds, "");
_Static_assert(offsetof(struct Segment, keys) == kBHKeyTable, "");
_Static_assert(offsetof(struct Segment, names) == kBHNames, "");
_Static_assert(offsetof(struct Segment, cells) == kBHCells, "");
_Static_assert(offsetof(struct Segment, chunks) == kBHChunks, "");
_Static_assert(sizeof(struct Segment) == kBHSegmentBytes, "");

/* What a handle points to. All zero in a process that has not recorded under the key. */
struct Key {
  _Atomic(struct Cell*) cell;  /* where adds go until its day ends */
  _Atomic uint32_t newestCell; /* number of the cell made last; `older` leads to the others */
  _Atomic uint32_t number;     /* the key's number in marks; 0 until the segment names the key */
};

/* A chunk that one or more threads fill, on a cache line of its own. */
struct Lane {
  alignas(64) _Atomic(struct Chunk*) chunk;
};

/* Memory that the kernel clears in a child (MADV_WIPEONFORK): a child begins without a segment, and
 * no call has to check whether it runs in a child. */
struct State {
  _Atomic(struct Segment*) segment;
  _Atomic uint64_t nameTime; /* the parts of its file's name; 0 until they are known */
  _Atomic uint64_t nameRoot;
  _Atomic uint64_t nameThread;
  _Atomic uint64_t retryAt; /* no segment is begun before these CLOCK_MONOTONIC seconds */
  _Atomic int status;       /* why there is none */
  _Atomic uint32_t nextLane;
  _Atomic(struct Chunk*) spareChunk; /* taken, but another thread was faster */
  _Atomic uint32_t fetchedChunks;    /* chunks whose memory is allocated */
  _Atomic uint64_t knownFolds;       /* the segment's folds at the last count of reusable chunks */
  _Atomic int32_t reusableChunks;    /* approximate number that folds have acknowledged */
  _Atomic uint32_t nextReusable;     /* where to look for one */
  _Atomic int lacksChunks;           /* the last measurement that needed memory was dropped */
  _Atomic int lacksCells;            /* the last scalar that needed memory was dropped */
  _Atomic uint64_t mayAskAt;         /* no fold is asked for before these CLOCK_MONOTONIC seconds */
  _Atomic int hasFreedChunks;        /* a fold made much room since one was last asked for */
  struct Lane lanes[kLanes];
  struct Key keys[kBHKeys];
  _Atomic uint16_t older[kBHCellCount]; /* number of the same key's next older cell; 0 is none */
};

/* Memory that children inherit with its content. */
struct Process {
  struct State* state;
  _Atomic(struct Segment*) mapped; /* the segment of this process, or of its parent */
  char folder[kLongestFolder];
};

#endif
