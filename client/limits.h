/* Every bound of the library, with its unit and its reason. The sizes of a segment's parts are in
 * segment_format.h. */
#ifndef BRIMHOLD_LIMITS_H
#define BRIMHOLD_LIMITS_H

enum {
  /* Bytes of the folder's path. */
  kLongestFolder = 4000,

  /* Chunks that threads fill at the same time. With more threads some share a chunk: correct, but
   * slower. Each costs a page once used. */
  kLanes = 64,

  /* Chunks whose memory is allocated at once: amortises the system call, and bounds the memory of a
   * process with few records. */
  kLargestFetch = 16,

  /* Seconds until the next attempt to begin a segment after a failure: a program that starts before
   * the folder exists soon records, and one without a folder pays only a clock read per value. */
  kRetrySeconds = 5,

  /* Seconds until a process asks for another fold. The first one may have failed, or made no room:
   * each costs CPU time, and a write to flash. */
  kAskSeconds = 60,

  /* Files in the folder beyond which new segments ask for folds: short-lived processes leave one
   * each, of 20 KiB. */
  kFilesBeforeFold = 256,

  /* Beyond that, one in this many new segments asks, and the clock decides which. A fold leaves the
   * files of live processes; when these alone exceed the number, each new program would otherwise
   * start a fold in vain. A prime, so that clocks that advance by a round number of nanoseconds hit
   * it, too. */
  kSegmentsPerFold = 127,

  /* No segment begins while less than this part of the tmpfs, usually all of /run, is free: when
   * folds fail for weeks, segments of ended processes would fill it. */
  kReservedPart = 8,

  /* Names tried for a new file. They contain a time in nanoseconds; a collision means that a
   * process in another PID namespace began in the same nanosecond. */
  kNameAttempts = 8
};

#endif
