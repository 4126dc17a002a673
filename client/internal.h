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

/* The library's memory; NULL before the first look-up, and while it cannot be created. */
struct Process* bhProcess(void);
/* The same, but creates the memory when it is missing; NULL with `status` on failure. */
struct Process* bhMakeProcess(BHClientStatus* status);

/* keys.c */

/* Names the key in the segment. Returns its number, or 0 when there is no memory for it. */
uint32_t bhNameKey(struct Process* process, struct Segment* segment, struct Key* key);
/* Why a key was refused last; Recording when none was. */
BHClientStatus bhRefusal(void);
/* Whether `key` is in the table of keys; the handle of refused keys is not. */
bool bhIsKey(const struct Process* process, const struct Key* key);

/* segment.c */

/* The process's segment; begins one when there is none. NULL on failure, see `State.status`. */
struct Segment* bhSegment(struct Process* process);
/* In a child: drops the parent's segment, to which it must not write. */
void bhForgetParent(void);
/* Ends a call that may have changed `State`. If a signal handler within the call forked this child,
 * clears the state, which describes the parent's segment. */
void bhForgetInterrupted(struct Process* process, const struct Segment* segment);
/* Allocates the pages: on a full tmpfs this call fails, and no later access raises SIGBUS. */
bool bhFetch(const void* from, size_t bytes);
/* Asks for a fold, unless it did so a short time ago and this is not urgent. */
void bhAskForFold(struct Process* process, bool isUrgent);
/* Counts a value for which there is no room, and notes in `State` what there is a lack of. */
void bhDrop(struct Process* process, struct Segment* segment, _Atomic int* lack);

/* segment_file.c */

/* What the name of a segment's file is made of, and where it is. */
struct SegmentName {
  uint64_t time; /* CLOCK_MONOTONIC, nanoseconds */
  uint64_t thread;
  uint64_t root; /* tells the process's root folder and mounts from others */
};

/* Creates and maps a new segment and fills in its header; NULL with `status` on failure. */
struct Segment* bhBeginSegment(const char* folder, struct SegmentName* name,
                               BHClientStatus* status);
void bhAbandonSegment(const char* folder, struct SegmentName name, struct Segment* segment);
/* Removed: the segment's file, or its folder, has been removed; not known in a process that has
 * changed its root folder or mounts. CannotAsk: the process could not create the file that asks for
 * a fold, in the folder that has its segment. Recording otherwise. */
BHClientStatus bhStatusOfFile(const char* folder, struct SegmentName name);
/* Replaces an inherited mapping with empty memory of the process's own. */
void bhForgetMapping(struct Segment* segment);
void bhPostFoldWanted(const char* folder);

/* facts.c */

/* Identifies the process for readers; unknown fields stay 0. */
void bhDescribeProcess(struct Segment* segment);

/* cells.c */

/* The key's cell for the current day; NULL when there is none. A lack of room is counted as a
 * dropped value. */
struct Cell* bhFindCell(struct Key* key);

/* chunks.c */

/* After a fold, counts the chunks that it has freed. */
void bhNoticeFold(struct Process* process, struct Segment* segment);
/* Records a value when the fast path cannot. */
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
