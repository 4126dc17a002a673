#include <signal.h>
#include <string.h>

#include "internal.h"

/* A child replaces its parent's segment with empty memory, so that the segment can be retired. The
 * addresses stay valid: a signal handler may have forked within a record, and will return there. */
static void forgetInherited(struct Process* process, struct Segment* inherited) {
  if (inherited && atomic_compare_exchange_strong(&process->mapped, &inherited, NULL)) {
    bhForgetMapping(inherited);
  }
}

void bhForgetParent(void) {
  struct Process* process = bhProcess();
  if (!process) return;
  struct Segment* mapped = atomic_load(&process->mapped);
  /* Another library's fork handler may have recorded in the child already. */
  if (!atomic_load(&process->state->segment)) forgetInherited(process, mapped);
}

void bhForgetInterrupted(struct Process* process, const struct Segment* segment) {
  struct State* state = process->state;
  if (atomic_load(&state->segment) != segment) memset(state, 0, sizeof *state);
}

static struct Segment* begin(struct Process* process, uint64_t now) {
  struct State* state = process->state;
  struct SegmentName name;
  BHClientStatus status = BHClientStatusFailed;
  struct Segment* begun = bhBeginSegment(process->folder, &name, &status);
  if (!begun) {
    atomic_store_explicit(&state->status, status, memory_order_relaxed);
    atomic_store_explicit(&state->retryAt, now + kRetrySeconds, memory_order_relaxed);
    return atomic_load_explicit(&state->segment, memory_order_acquire);
  }
  /* No thread waits here for another, or for the code that a signal handler has interrupted: each
   * begins a segment, and only one is kept. */
  struct Segment* known = NULL;
  if (atomic_compare_exchange_strong_explicit(&state->segment, &known, begun, memory_order_acq_rel,
                                              memory_order_acquire)) {
    atomic_store(&process->mapped, begun);
    atomic_store_explicit(&state->nameTime, name.time, memory_order_relaxed);
    atomic_store_explicit(&state->nameRoot, name.root, memory_order_relaxed);
    atomic_store_explicit(&state->nameThread, name.thread, memory_order_release);
    return begun;
  }
  bhAbandonSegment(process->folder, name, begun);
  return known;
}

struct Segment* bhSegment(struct Process* process) {
  struct State* state = process->state;
  /* Read first: a segment of this process is published before it is noted as mapped. */
  struct Segment* mapped = atomic_load(&process->mapped);
  struct Segment* known = atomic_load_explicit(&state->segment, memory_order_acquire);
  if (known) return known;
  forgetInherited(process, mapped);
  const uint64_t now = bhSeconds(CLOCK_MONOTONIC_COARSE);
  if (now < atomic_load_explicit(&state->retryAt, memory_order_relaxed)) return NULL;

  /* A child forked here by a signal handler would return here and share the segment. */
  sigset_t all, before;
  sigfillset(&all);
  pthread_sigmask(SIG_SETMASK, &all, &before);
  struct Segment* begun = begin(process, now);
  pthread_sigmask(SIG_SETMASK, &before, NULL);
  return begun;
}

void bhAskForFold(struct Process* process, bool isUrgent) {
  struct State* state = process->state;
  const uint64_t now = bhSeconds(CLOCK_MONOTONIC_COARSE);
  uint64_t mayAskAt = atomic_load_explicit(&state->mayAskAt, memory_order_relaxed);
  if (now < mayAskAt && !isUrgent) return;
  /* One of several threads asks. */
  if (atomic_compare_exchange_strong(&state->mayAskAt, &mayAskAt, now + kAskSeconds)) {
    bhPostFoldWanted(process->folder);
  }
}

void bhDrop(struct Process* process, struct Segment* segment, _Atomic int* lack) {
  atomic_store_explicit(lack, 1, memory_order_relaxed);
  bhAskForFold(process, false);
  atomic_fetch_add_explicit(&segment->dropped, 1, memory_order_relaxed);
}

static const char* textOf(BHClientStatus status) {
  switch (status) {
    case BHClientStatusRecording:
      return "values are recorded";
    case BHClientStatusNoKey:
      return "no key has been looked up yet";
    case BHClientStatusNoFolder:
      return "the device has no folder /run/tavrel/stat: nothing is recorded";
    case BHClientStatusNotAllowed:
      return "this user may not create files in /run/tavrel/stat, or it is read-only for this "
             "process: nothing is recorded";
    case BHClientStatusNotInMemory:
      return "/run/tavrel/stat is not on a tmpfs: nothing is recorded";
    case BHClientStatusNoSpace:
      return "less than an eighth of the tmpfs of /run/tavrel/stat is free, or a limit of the "
             "process is exhausted: nothing is recorded";
    case BHClientStatusUnsupported:
      return "the kernel lacks MADV_WIPEONFORK, or TAVREL_ROOT is too long or relative to a folder "
             "that is gone: nothing is recorded";
    case BHClientStatusFailed:
      return "the system failed to create a file in /run/tavrel/stat: nothing is recorded";
    case BHClientStatusFull:
      return "the segment is full: values are dropped until a fold makes room";
    case BHClientStatusRemoved:
      return "the process's file in /run/tavrel/stat has been removed: values are lost until the "
             "process is restarted";
    case BHClientStatusCannotAsk:
      return "values are recorded until the segment is full: this process, which has changed its "
             "user, root folder or mounts, cannot ask for a fold in /run/tavrel/stat";
    case BHClientStatusKeyRefused:
      return "values are recorded, except those of a refused key: it is empty, longer than 1024 "
             "bytes, has control characters, is not UTF-8, exceeds the 4096 keys or 256 KiB of "
             "names that a process may have, or was looked up when there was no memory";
  }
  return "unknown status";
}

/* Without a thread while the one that begins the segment has not noted its name yet. */
static struct SegmentName nameOfSegment(struct State* state) {
  struct SegmentName name;
  name.thread = atomic_load_explicit(&state->nameThread, memory_order_acquire);
  name.time = atomic_load_explicit(&state->nameTime, memory_order_relaxed);
  name.root = atomic_load_explicit(&state->nameRoot, memory_order_relaxed);
  return name;
}

static BHClientStatus currentStatus(void) {
  const BHClientStatus refusal = bhRefusal();
  struct Process* process = bhProcess();
  if (!process) return refusal == BHClientStatusRecording ? BHClientStatusNoKey : refusal;
  struct State* state = process->state;
  struct Segment* segment = bhSegment(process);
  if (!segment) return (BHClientStatus)atomic_load_explicit(&state->status, memory_order_relaxed);
  /* The program may wait for room before it records again. */
  bhNoticeFold(process, segment);
  bhForgetInterrupted(process, segment);
  const struct SegmentName name = nameOfSegment(state);
  const BHClientStatus status =
      name.thread != 0 ? bhStatusOfFile(process->folder, name) : BHClientStatusRecording;
  /* Threads keep pointers into the segment, so that no other can take its place. */
  if (status == BHClientStatusRemoved) return status;
  if (atomic_load_explicit(&state->lacksChunks, memory_order_relaxed) ||
      atomic_load_explicit(&state->lacksCells, memory_order_relaxed)) {
    return BHClientStatusFull;
  }
  if (status == BHClientStatusCannotAsk) return status;
  return refusal == BHClientStatusRecording ? refusal : BHClientStatusKeyRefused;
}

BHClientStatus BHClientGetStatus(const char** text) {
  const int error = errno;
  const BHClientStatus status = currentStatus();
  if (text) *text = textOf(status);
  errno = error;
  return status;
}
