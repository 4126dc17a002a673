/* Every bound of the library, with its unit and its reason. segment_format.h has the sizes of a
 * segment's parts. */
#ifndef BRIMHOLD_LIMITS_H
#define BRIMHOLD_LIMITS_H

enum {
  /* Bytes of the folder's path. */
  kLongestFolder = 4000,

  /* Chunks that threads fill at the same time. With more threads some share a chunk: correct, but
   * slower. Each costs a page once used. */
  kLanes = 64,

  /* Chunks whose memory is fetched at once: amortises the system call, and bounds what a process
   * with few records takes. */
  kLargestFetch = 16,

  /* Seconds until a segment that could not be begun is tried again: a program that starts before
   * the folder exists records soon, and one without a folder pays a clock read per value. */
  kRetrySeconds = 5,

  /* Segments in the folder beyond which a new one asks for a fold: short-lived processes leave
   * one each, of 20 KiB. */
  kSegmentsBeforeFold = 256,

  /* Names tried for a new file. They hold a time in nanoseconds; a collision means that a process
   * of another PID namespace began in the same one. */
  kNameAttempts = 8
};

#endif
