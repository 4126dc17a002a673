/* The interfaces between the library's own files. */
#ifndef BRIMHOLD_INTERNAL_H
#define BRIMHOLD_INTERNAL_H

#include <errno.h>
#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>
#include <time.h>

#include "brimhold/client.h"
#include "layout.h"

/* process.c */

/* The library's memory; NULL before the first look-up, and when the kernel lacks a feature. */
struct Process* bhProcess(void);
/* The same, but creates missing memory. */
struct Process* bhMakeProcess(void);

/* keys.c */

/* Names the key in the segment. Returns its number, or 0 without memory for it. */
uint32_t bhNameKey(struct Process* process, struct Segment* segment, struct Key* key);
bool bhWasKeyRefused(void);
/* A place in the table of keys; refused handles have none. */
bool bhIsKey(const struct Process* process, const struct Key* key);

/* segment.c */

/* The process's segment; begins one when there is none. NULL on failure, see `State.status`. */
struct Segment* bhSegment(struct Process* process);
/* In a child: lets go of the parent's segment, in which it must not write. */
void bhForgetParent(void);
/* Ends a call that may have changed `State`: what it noted of a segment that is not this process's,
 * because a signal handler within the call made this child, is emptied again. */
void bhForgetInterrupted(struct Process* process, const struct Segment* segment);
/* Fetches memory, so that a full tmpfs shows here and not as SIGBUS. */
bool bhFetch(const void* from, size_t bytes);
void bhAskForFold(struct Process* process);
/* Counts a value for which there is no room. */
void bhDrop(struct Process* process, struct Segment* segment);

/* segment_file.c */

/* Makes, maps and describes a new segment; NULL with `status` when that fails. */
struct Segment* bhBeginSegment(const char* folder, char name[64], BHClientStatus* status);
void bhAbandonSegment(const char* folder, const char* name, struct Segment* segment);
/* Replaces a mapping that the process inherited by empty memory of its own. */
void bhForgetMapping(struct Segment* segment);
void bhPostFoldWanted(const char* folder);

/* facts.c */

/* Identifies the process for readers; fields that cannot be found out stay 0. */
void bhDescribeProcess(struct Segment* segment);

/* cells.c */

/* The cell of the key for what the clocks show; NULL, counted as dropped, when there is none. */
struct Cell* bhFindCell(struct Key* key);

/* chunks.c */

/* Finds out which chunks the last fold has freed. */
void bhNoticeFold(struct Process* process, struct Segment* segment);
/* Records when the fast path cannot. */
void bhRecordSlowly(struct Key* key, double value);

/* Times. */

static inline uint64_t bhSeconds(clockid_t clock) {
  struct timespec now = {0};
  clock_gettime(clock, &now);
  return (uint64_t)now.tv_sec;
}

/* Whether a clock that shows `seconds` can be right. */
static inline bool bhIsCredible(uint64_t seconds) {
  return (int64_t)seconds >= BRIMHOLD_BUILD_DAY * (int64_t)kBHSecondsPerDay;
}

#endif
