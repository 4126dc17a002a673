/* Record statistics from any program.
 *
 *   #include <brimhold/client.h>
 *   static BHClientScalarKey* starts;                    // a counter of the day
 *   starts = BHClientScalarForKey("com.example.starts"); // once, when the program starts
 *   BHClientScalarAdd(starts, 1);                        // anywhere, as often as you like
 *
 * Build with `pkg-config --cflags --libs brimhold`.
 *
 * Purpose. A scalar is a number per UTC day: counts are added, gauges are set. A distribution is a
 * series of measurements, each kept with its second. The system folds recorded values into its
 * statistics store, every hour and when a segment fills up, and reports the keys that its whitelist
 * names. `tavrelctl stat show KEY` shows a value right away.
 *
 * Cost. An add or a record is a few nanoseconds: a clock read and an atomic add in memory. There is
 * no daemon, no lock and no write to flash. A process that records takes 20 KiB of memory, and at
 * most 4 MiB. Calls make system calls only now and then, as when a page fills up or a day begins.
 *
 * Guarantees.
 *  - No call reports a failure, waits for another thread or process, allocates from the heap,
 *    changes errno or raises a signal. When recording is impossible, the calls do nothing;
 *    BHClientGetStatus says why.
 *  - Every call but the two look-ups may be made in a signal handler, and all of them from any
 *    thread. Handles live as long as the process and stay valid in children.
 *  - Values recorded before the process ended, however it ended, are folded exactly once. A power
 *    cut loses the values recorded since the last fold.
 *  - A value belongs to the UTC day that the clock showed (CLOCK_REALTIME_COARSE, which lags by
 *    some milliseconds). While the clock is older than this library, as on a device that has just
 *    started without a battery clock, values are dated once it has been set.
 *  - A set replaces what this process added or set earlier that day; when two processes set a
 *    scalar, the later set counts. Added on top is what other processes have added since the last
 *    fold, before the set or after it, unless they have set the scalar themselves in that time.
 *    Adds that follow a process's own set belong to that set: if another process has set the
 *    scalar later, the next fold drops them with it, even those that came last.
 *  - A process that records faster than the system folds (some 200,000 records) loses the excess,
 *    and the system counts the loss.
 *
 * After fork the child records into memory of its own. Do not record between vfork and exec. A
 * program that changes its user, its groups or its root folder should record its first value
 * afterwards: otherwise its values are the former user's, and when its segment fills up, it may
 * have no right to ask for a fold.
 */
#ifndef BRIMHOLD_CLIENT_H
#define BRIMHOLD_CLIENT_H

#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

#if defined(__GNUC__)
#define BH_CLIENT_PUBLIC __attribute__((visibility("default")))
#else
#define BH_CLIENT_PUBLIC
#endif

typedef struct BHClientScalarKey BHClientScalarKey;
typedef struct BHClientDistributionKey BHClientDistributionKey;

/* Looks up a key; the same name gives the same handle. The name is copied. Never returns NULL: the
 * values of a refused key are dropped. A key is refused when it is NULL, empty or longer than 1024
 * bytes, has control characters or is not UTF-8, when the process would have more than 4096 keys
 * or 256 KiB of names, or when the library could not get its memory; in that case look the key up
 * again later. The other calls accept NULL, and drop the value. */
BH_CLIENT_PUBLIC BHClientScalarKey* BHClientScalarForKey(const char* key);
BH_CLIENT_PUBLIC BHClientDistributionKey* BHClientDistributionForKey(const char* key);

/* Adds to today's value, which starts at 0. Sums wrap in two's complement. */
BH_CLIENT_PUBLIC void BHClientScalarAdd(BHClientScalarKey* key, int64_t amount);
/* Replaces today's value, except what other processes have added since the last fold without
 * setting it. */
BH_CLIENT_PUBLIC void BHClientScalarSet(BHClientScalarKey* key, int64_t value);

/* Appends a measurement. */
BH_CLIENT_PUBLIC void BHClientDistributionRecord(BHClientDistributionKey* key, double value);

/* Measures how long something takes, on the monotonic clock. A timer may be stopped more than
 * once; each stop records the time since its start.
 *
 *   BHClientTimer timer = BHClientTimerStart();
 *   work();
 *   BHClientTimerStopMilliseconds(timer, duration);
 */
typedef struct BHClientTimer {
  uint64_t nanoseconds;
} BHClientTimer;

BH_CLIENT_PUBLIC BHClientTimer BHClientTimerStart(void);
BH_CLIENT_PUBLIC void BHClientTimerStopSeconds(BHClientTimer timer, BHClientDistributionKey* key);
BH_CLIENT_PUBLIC void BHClientTimerStopMilliseconds(BHClientTimer timer,
                                                    BHClientDistributionKey* key);

typedef enum BHClientStatus {
  BHClientStatusRecording = 0,   /* values are kept */
  BHClientStatusNoKey = 1,       /* no key has been looked up yet */
  BHClientStatusNoFolder = 2,    /* the device has no folder for segments */
  BHClientStatusNotAllowed = 3,  /* this user may not create files in it */
  BHClientStatusNotInMemory = 4, /* the folder is not on a tmpfs */
  BHClientStatusNoSpace = 5,     /* the tmpfs is nearly full, or a limit is reached */
  BHClientStatusUnsupported = 6, /* the kernel is older than 4.14, or TAVREL_ROOT is unusable */
  BHClientStatusFailed = 7,      /* the system failed for another reason */
  BHClientStatusFull = 8,        /* values are dropped until a fold makes room */
  BHClientStatusKeyRefused = 9,  /* values are kept, but a look-up was refused */
  BHClientStatusRemoved = 10,    /* the file that takes the values has been removed */
  BHClientStatusCannotAsk = 11   /* values are kept, but the process can ask for no fold */
} BHClientStatus;

/* Says whether values recorded now are kept, and if not, why. Starts recording if necessary.
 * `text`, if not NULL, receives a sentence that lives as long as the process. */
BH_CLIENT_PUBLIC BHClientStatus BHClientGetStatus(const char** text);

#ifdef __cplusplus
}
#endif

#endif
