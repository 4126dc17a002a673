/* Preloaded into programs by script/crash-test.
 *
 *   CRASH_CLOCK    seconds since 1970 that the wall clock shows; it stands still, so that a run and
 *                  its repetition write the same
 *   CRASH_STOPS    when set, the process stops itself (SIGSTOP) before and after each call that a
 *                  file system must keep in order
 */
#define _GNU_SOURCE
#include <dlfcn.h>
#include <signal.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/syscall.h>
#include <sys/time.h>
#include <time.h>
#include <unistd.h>

static time_t now(void) {
  const char* const seconds = getenv("CRASH_CLOCK");
  return seconds == NULL ? 0 : (time_t)atoll(seconds);
}

int clock_gettime(clockid_t clock, struct timespec* time) {
  if (clock != CLOCK_REALTIME && clock != CLOCK_REALTIME_COARSE)
    return (int)syscall(SYS_clock_gettime, clock, time);
  *time = (struct timespec){.tv_sec = now()};
  return 0;
}

time_t time(time_t* copy) {
  if (copy != NULL) *copy = now();
  return now();
}

int gettimeofday(struct timeval* time, void* zone) {
  (void)zone;
  *time = (struct timeval){.tv_sec = now()};
  return 0;
}

static void stop(void) {
  if (getenv("CRASH_STOPS") != NULL) raise(SIGSTOP);
}

/* Calls the function of the C library between two stops. */
#define BETWEEN_STOPS(name, parameters, arguments) \
  int name parameters {                            \
    static __typeof__(&name) real = NULL;          \
    if (real == NULL) {                            \
      void* const found = dlsym(RTLD_NEXT, #name); \
      memcpy(&real, &found, sizeof real);          \
    }                                              \
    stop();                                        \
    const int result = real arguments;             \
    stop();                                        \
    return result;                                 \
  }

BETWEEN_STOPS(fsync, (int file), (file))
BETWEEN_STOPS(fdatasync, (int file), (file))
BETWEEN_STOPS(rename, (const char* from, const char* to), (from, to))
BETWEEN_STOPS(unlink, (const char* path), (path))
