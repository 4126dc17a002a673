/* Preloaded into programs that live a simulated life. The clocks show what a file says, which the
 * driver maps as well. The real-time clock and the time since boot stand still between two strokes,
 * so that each date is known; the monotonic clock keeps going, so that deadlines pass.
 *
 *   LIFE_CLOCK    the file, struct Shared
 *   LIFE_KILL_AT  the process is killed before this call, counting calls that change files
 *   LIFE_PACED    waits for a signal last until the driver has asked for one more stroke
 *
 * When the program ends, the file has its peak memory and the number of such calls. */
#define _GNU_SOURCE
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <signal.h>
#include <stdarg.h>
#include <stdatomic.h>
#include <stdint.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/time.h>
#include <time.h>
#include <unistd.h>

struct Shared {
  _Atomic int64_t realNanoseconds;
  _Atomic int64_t bootNanoseconds;
  _Atomic int64_t peakKibibytes; /* of the last program that ended */
  _Atomic int64_t calls;         /* that it made */
  _Atomic int64_t strokesAsked;
  _Atomic int64_t strokesDone;
};

enum { kNanoseconds = 1000000000 };

static struct Shared* shared;
static _Atomic int64_t calls;
static int64_t killAt;
static int isPaced;
static _Atomic int64_t strokes;

static void begin(void) {
  static _Atomic int begun;
  if (atomic_exchange(&begun, 1)) return;
  const char* path = getenv("LIFE_CLOCK");
  const int file = path ? open(path, O_RDWR | O_CLOEXEC) : -1;
  void* mapped = file < 0 ? MAP_FAILED
                          : mmap(NULL, sizeof *shared, PROT_READ | PROT_WRITE, MAP_SHARED, file, 0);
  if (mapped == MAP_FAILED) abort();
  close(file);
  shared = mapped;
  const char* at = getenv("LIFE_KILL_AT");
  atomic_store(&calls, 0);
  killAt = at ? atoll(at) : 0;
  isPaced = getenv("LIFE_PACED") != NULL;
}

__attribute__((constructor)) static void beginEarly(void) {
  begin();
}

/* In the kernel's account, a process's peak memory includes that of its parent; this figure does
 * not. */
__attribute__((destructor)) static void leaveFigures(void) {
  atomic_store(&shared->calls, calls);
  FILE* status = fopen("/proc/self/status", "re");
  char line[256];
  while (status && fgets(line, sizeof line, status)) {
    long peak;
    if (sscanf(line, "VmHWM: %ld", &peak) == 1) atomic_store(&shared->peakKibibytes, peak);
  }
  if (status) fclose(status);
}

static void* next(const char* name) {
  begin();
  return dlsym(RTLD_NEXT, name);
}
#define NEXT(name)               \
  static __typeof__(name)* real; \
  if (!real) real = (__typeof__(real))next(#name)

static struct timespec spec(int64_t nanoseconds) {
  return (struct timespec){nanoseconds / kNanoseconds, nanoseconds % kNanoseconds};
}

int clock_gettime(clockid_t clock, struct timespec* time) {
  NEXT(clock_gettime);
  switch (clock) {
    case CLOCK_REALTIME:
    case CLOCK_REALTIME_COARSE:
      *time = spec(shared->realNanoseconds);
      return 0;
    case CLOCK_BOOTTIME:
      *time = spec(shared->bootNanoseconds);
      return 0;
    case CLOCK_MONOTONIC:
    case CLOCK_MONOTONIC_COARSE:
      if (!isPaced) return real(clock, time);
      *time = spec(strokes * kNanoseconds);
      return 0;
    default:
      return real(clock, time);
  }
}

int gettimeofday(struct timeval* restrict time, void* restrict zone) {
  (void)zone;
  struct timespec now;
  clock_gettime(CLOCK_REALTIME, &now);
  *time = (struct timeval){now.tv_sec, now.tv_nsec / 1000};
  return 0;
}

time_t time(time_t* result) {
  struct timespec now;
  clock_gettime(CLOCK_REALTIME, &now);
  if (result) *result = now.tv_sec;
  return now.tv_sec;
}

/* A stroke is complete once the program waits for the next one. */
int sigtimedwait(const sigset_t* restrict set, siginfo_t* restrict info,
                 const struct timespec* restrict timeout) {
  NEXT(sigtimedwait);
  if (!isPaced || (timeout->tv_sec == 0 && timeout->tv_nsec == 0)) return real(set, info, timeout);
  atomic_store(&shared->strokesDone, strokes);
  while (atomic_load(&shared->strokesAsked) <= strokes) {
    const struct timespec instant = {0, 500000};
    const int got = real(set, info, &instant);
    if (got > 0) return got;
  }
  ++strokes;
  errno = EAGAIN;
  return -1;
}

static void count(void) {
  if (atomic_fetch_add(&calls, 1) + 1 == killAt) raise(SIGKILL);
}

#define COUNTED(type, name, parameters, arguments) \
  type name parameters {                           \
    NEXT(name);                                    \
    count();                                       \
    return real arguments;                         \
  }
COUNTED(ssize_t, write, (int file, const void* from, size_t size), (file, from, size))
COUNTED(ssize_t, pwrite, (int file, const void* from, size_t size, off_t at),
        (file, from, size, at))
COUNTED(ssize_t, pwrite64, (int file, const void* from, size_t size, off64_t at),
        (file, from, size, at))
COUNTED(int, fsync, (int file), (file))
COUNTED(int, fdatasync, (int file), (file))
COUNTED(int, ftruncate, (int file, off_t length), (file, length))
COUNTED(int, ftruncate64, (int file, off64_t length), (file, length))
COUNTED(int, rename, (const char* from, const char* to), (from, to))
COUNTED(int, renameat, (int from, const char* a, int to, const char* b), (from, a, to, b))
COUNTED(int, unlink, (const char* path), (path))
COUNTED(int, unlinkat, (int folder, const char* path, int flags), (folder, path, flags))
COUNTED(int, mkdir, (const char* path, mode_t mode), (path, mode))
