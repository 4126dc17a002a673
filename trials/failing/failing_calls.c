/* Preloaded into a program by script/failing-calls: makes one call of a kind fail, or all from it
 * on.
 *
 *   FAILING_KIND    one of kNames
 *   FAILING_AT      which call of that kind, from 1; "12+" is the twelfth and all later ones
 *   FAILING_MARK    a file that is made once a call has failed; it is empty when that was before
 *                   `main`, else it has one byte
 *   FAILING_SKIPS_WAITS  when set, time passes at once while the program waits and nothing comes
 */
#define _GNU_SOURCE
#include <dirent.h>
#include <dlfcn.h>
#include <errno.h>
#include <fcntl.h>
#include <poll.h>
#include <pthread.h>
#include <stdarg.h>
#include <stdatomic.h>
#include <stdbool.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <sys/epoll.h>
#include <sys/file.h>
#include <sys/mman.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/uio.h>
#include <time.h>
#include <unistd.h>

enum Kind {
  kNone,
  kAllocation,
  kOpen,
  kRead,
  kWrite,
  kFlush,
  kRename,
  kMap,
  kTruncate,
  kRemove,
  kFolder,
  kLock,
  kThread,
  kListing,
  kKinds
};

static const char* const kNames[kKinds] = {"none",   "allocation", "open",   "read",     "write",
                                           "flush",  "rename",     "map",    "truncate", "remove",
                                           "folder", "lock",       "thread", "listing"};

enum { kLongestWait = 50 /* milliseconds */ };

static enum Kind kind;
static long at;
static bool andLater;
static const char* mark;
static bool mainBegan;
static bool skipsWaits;
static atomic_long calls;
static atomic_long skipped; /* milliseconds */

__attribute__((constructor)) static void readSettings(void) {
  const char* const name = getenv("FAILING_KIND");
  const char* const number = getenv("FAILING_AT");
  mark = getenv("FAILING_MARK");
  skipsWaits = getenv("FAILING_SKIPS_WAITS") != NULL;
  if (name == NULL || number == NULL || mark == NULL) return;
  char* end = NULL;
  at = strtol(number, &end, 10);
  andLater = *end == '+';
  for (enum Kind each = kAllocation; each < kKinds; ++each) {
    if (strcmp(name, kNames[each]) == 0) kind = each;
  }
}

/* The function of the C library. Found while it is called, as dlsym itself may allocate. */
#define REAL(name)                               \
  static __typeof__(&name) real = NULL;          \
  if (real == NULL) {                            \
    void* const found = dlsym(RTLD_NEXT, #name); \
    memcpy(&real, &found, sizeof real);          \
  }

static void leaveMark(void) {
  REAL(syscall)
  const long file = real(SYS_openat, AT_FDCWD, mark, O_CREAT | O_WRONLY, 0600);
  if (file < 0) return;
  if (mainBegan) real(SYS_write, file, "x", 1L);
  real(SYS_close, file);
}

static bool fails(enum Kind called, int error) {
  if (called != kind) return false;
  const long number = atomic_fetch_add(&calls, 1) + 1;
  if (number != at && !(andLater && number > at)) return false;
  if (number == at) leaveMark();
  errno = error;
  return true;
}

typedef int Main(int, char**, char**);

static Main* programMain;

static int beginMain(int count, char** arguments, char** environment) {
  mainBegan = true;
  return programMain(count, arguments, environment);
}

int __libc_start_main(Main* program, int count, char** arguments, void (*start)(void),
                      void (*end)(void), void (*loaderEnd)(void), void* stackEnd) {
  REAL(__libc_start_main)
  programMain = program;
  return real(beginMain, count, arguments, start, end, loaderEnd, stackEnd);
}

extern void* __libc_malloc(size_t size);
extern void* __libc_calloc(size_t count, size_t size);
extern void* __libc_realloc(void* block, size_t size);

void* malloc(size_t size) {
  return fails(kAllocation, ENOMEM) ? NULL : __libc_malloc(size);
}
void* calloc(size_t count, size_t size) {
  return fails(kAllocation, ENOMEM) ? NULL : __libc_calloc(count, size);
}
void* realloc(void* block, size_t size) {
  return fails(kAllocation, ENOMEM) ? NULL : __libc_realloc(block, size);
}

static mode_t modeOf(int flags, va_list arguments) {
  return (flags & (O_CREAT | O_TMPFILE)) != 0 ? va_arg(arguments, mode_t) : 0;
}

int open(const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = modeOf(flags, arguments);
  va_end(arguments);
  REAL(open)
  return fails(kOpen, EMFILE) ? -1 : real(path, flags, mode);
}
int open64(const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = modeOf(flags, arguments);
  va_end(arguments);
  REAL(open64)
  return fails(kOpen, EMFILE) ? -1 : real(path, flags, mode);
}
int openat64(int folder, const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = modeOf(flags, arguments);
  va_end(arguments);
  REAL(openat64)
  return fails(kOpen, EMFILE) ? -1 : real(folder, path, flags, mode);
}
FILE* fopen(const char* path, const char* mode) {
  REAL(fopen)
  return fails(kOpen, EMFILE) ? NULL : real(path, mode);
}
FILE* fopen64(const char* path, const char* mode) {
  REAL(fopen64)
  return fails(kOpen, EMFILE) ? NULL : real(path, mode);
}
DIR* opendir(const char* path) {
  REAL(opendir)
  return fails(kOpen, EMFILE) ? NULL : real(path);
}
int openat(int folder, const char* path, int flags, ...) {
  va_list arguments;
  va_start(arguments, flags);
  const mode_t mode = modeOf(flags, arguments);
  va_end(arguments);
  REAL(openat)
  return fails(kOpen, EMFILE) ? -1 : real(folder, path, flags, mode);
}

ssize_t read(int file, void* bytes, size_t length) {
  REAL(read)
  return fails(kRead, EIO) ? -1 : real(file, bytes, length);
}
ssize_t pread(int file, void* bytes, size_t length, off_t offset) {
  REAL(pread)
  return fails(kRead, EIO) ? -1 : real(file, bytes, length, offset);
}
ssize_t pread64(int file, void* bytes, size_t length, off64_t offset) {
  REAL(pread64)
  return fails(kRead, EIO) ? -1 : real(file, bytes, length, offset);
}

ssize_t write(int file, const void* bytes, size_t length) {
  REAL(write)
  return fails(kWrite, ENOSPC) ? -1 : real(file, bytes, length);
}
ssize_t writev(int file, const struct iovec* pieces, int count) {
  REAL(writev)
  return fails(kWrite, ENOSPC) ? -1 : real(file, pieces, count);
}
ssize_t pwrite(int file, const void* bytes, size_t length, off_t offset) {
  REAL(pwrite)
  return fails(kWrite, ENOSPC) ? -1 : real(file, bytes, length, offset);
}
ssize_t pwrite64(int file, const void* bytes, size_t length, off64_t offset) {
  REAL(pwrite64)
  return fails(kWrite, ENOSPC) ? -1 : real(file, bytes, length, offset);
}

int fsync(int file) {
  REAL(fsync)
  return fails(kFlush, EIO) ? -1 : real(file);
}
int fdatasync(int file) {
  REAL(fdatasync)
  return fails(kFlush, EIO) ? -1 : real(file);
}

int link(const char* from, const char* to) {
  REAL(link)
  return fails(kRename, EIO) ? -1 : real(from, to);
}
int rename(const char* from, const char* to) {
  REAL(rename)
  return fails(kRename, EIO) ? -1 : real(from, to);
}
int renameat(int fromFolder, const char* from, int toFolder, const char* to) {
  REAL(renameat)
  return fails(kRename, EIO) ? -1 : real(fromFolder, from, toFolder, to);
}
int renameat2(int fromFolder, const char* from, int toFolder, const char* to, unsigned flags) {
  REAL(renameat2)
  return fails(kRename, EIO) ? -1 : real(fromFolder, from, toFolder, to, flags);
}

void* mmap(void* address, size_t length, int protection, int flags, int file, off_t offset) {
  REAL(mmap)
  return fails(kMap, ENOMEM) ? MAP_FAILED : real(address, length, protection, flags, file, offset);
}
void* mmap64(void* address, size_t length, int protection, int flags, int file, off64_t offset) {
  REAL(mmap64)
  return fails(kMap, ENOMEM) ? MAP_FAILED : real(address, length, protection, flags, file, offset);
}

int ftruncate(int file, off_t length) {
  REAL(ftruncate)
  return fails(kTruncate, ENOSPC) ? -1 : real(file, length);
}
int ftruncate64(int file, off64_t length) {
  REAL(ftruncate64)
  return fails(kTruncate, ENOSPC) ? -1 : real(file, length);
}
int fallocate(int file, int mode, off_t offset, off_t length) {
  REAL(fallocate)
  return fails(kTruncate, ENOSPC) ? -1 : real(file, mode, offset, length);
}
int fallocate64(int file, int mode, off64_t offset, off64_t length) {
  REAL(fallocate64)
  return fails(kTruncate, ENOSPC) ? -1 : real(file, mode, offset, length);
}

int unlink(const char* path) {
  REAL(unlink)
  return fails(kRemove, EIO) ? -1 : real(path);
}
int unlinkat(int folder, const char* path, int flags) {
  REAL(unlinkat)
  return fails(kRemove, EIO) ? -1 : real(folder, path, flags);
}

int mkdir(const char* path, mode_t mode) {
  REAL(mkdir)
  return fails(kFolder, ENOSPC) ? -1 : real(path, mode);
}
int mkdirat(int folder, const char* path, mode_t mode) {
  REAL(mkdirat)
  return fails(kFolder, ENOSPC) ? -1 : real(folder, path, mode);
}

int flock(int file, int operation) {
  REAL(flock)
  return fails(kLock, ENOLCK) ? -1 : real(file, operation);
}

struct dirent* readdir(DIR* folder) {
  REAL(readdir)
  return fails(kListing, EIO) ? NULL : real(folder);
}
struct dirent64* readdir64(DIR* folder) {
  REAL(readdir64)
  return fails(kListing, EIO) ? NULL : real(folder);
}

int pthread_create(pthread_t* thread, const pthread_attr_t* attributes, void* (*start)(void*),
                   void* argument) {
  REAL(pthread_create)
  return fails(kThread, EAGAIN) ? EAGAIN : real(thread, attributes, start, argument);
}

/* All that comes is there at the start. */
static int shortened(int timeout) {
  return skipsWaits && timeout > kLongestWait ? kLongestWait : timeout;
}
static int waited(int ready, int timeout) {
  if (ready == 0) atomic_fetch_add(&skipped, timeout - shortened(timeout));
  return ready;
}
int epoll_wait(int file, struct epoll_event* events, int count, int timeout) {
  REAL(epoll_wait)
  return waited(real(file, events, count, shortened(timeout)), timeout);
}
int poll(struct pollfd* files, nfds_t count, int timeout) {
  REAL(poll)
  return waited(real(files, count, shortened(timeout)), timeout);
}
int nanosleep(const struct timespec* pause, struct timespec* left) {
  REAL(nanosleep)
  const long asked = pause->tv_sec * 1000 + pause->tv_nsec / 1000000;
  if (!skipsWaits || asked <= kLongestWait) return real(pause, left);
  const struct timespec shorter = {.tv_nsec = kLongestWait * 1000000L};
  atomic_fetch_add(&skipped, asked - kLongestWait);
  return real(&shorter, left);
}
int clock_gettime(clockid_t clock, struct timespec* now) {
  REAL(clock_gettime)
  const int result = real(clock, now);
  if (result == 0 && clock == CLOCK_MONOTONIC) {
    const long passed = atomic_load(&skipped);
    now->tv_sec += passed / 1000;
    now->tv_nsec += passed % 1000 * 1000000;
    if (now->tv_nsec >= 1000000000) {
      now->tv_sec += 1;
      now->tv_nsec -= 1000000000;
    }
  }
  return result;
}

/* What libbrimhold calls so, past the functions above. */
long syscall(long number, ...) {
  va_list arguments;
  va_start(arguments, number);
  long values[6];
  for (int i = 0; i < 6; ++i)
    values[i] = va_arg(arguments, long);
  va_end(arguments);
  if (number == SYS_openat && fails(kOpen, EMFILE)) return -1;
  if (number == SYS_read && fails(kRead, EIO)) return -1;
  REAL(syscall)
  return real(number, values[0], values[1], values[2], values[3], values[4], values[5]);
}

/* What the functions above become where the compiler checks sizes (_FORTIFY_SOURCE). */
extern int __open_2(const char* path, int flags);
extern int __open64_2(const char* path, int flags);
extern int __openat_2(int folder, const char* path, int flags);
extern int __openat64_2(int folder, const char* path, int flags);
extern ssize_t __read_chk(int file, void* bytes, size_t length, size_t room);
extern ssize_t __pread_chk(int file, void* bytes, size_t length, off_t offset, size_t room);
extern ssize_t __pread64_chk(int file, void* bytes, size_t length, off64_t offset, size_t room);

int __open_2(const char* path, int flags) {
  REAL(__open_2)
  return fails(kOpen, EMFILE) ? -1 : real(path, flags);
}
int __open64_2(const char* path, int flags) {
  REAL(__open64_2)
  return fails(kOpen, EMFILE) ? -1 : real(path, flags);
}
int __openat_2(int folder, const char* path, int flags) {
  REAL(__openat_2)
  return fails(kOpen, EMFILE) ? -1 : real(folder, path, flags);
}
int __openat64_2(int folder, const char* path, int flags) {
  REAL(__openat64_2)
  return fails(kOpen, EMFILE) ? -1 : real(folder, path, flags);
}
ssize_t __read_chk(int file, void* bytes, size_t length, size_t room) {
  REAL(__read_chk)
  return fails(kRead, EIO) ? -1 : real(file, bytes, length, room);
}
ssize_t __pread_chk(int file, void* bytes, size_t length, off_t offset, size_t room) {
  REAL(__pread_chk)
  return fails(kRead, EIO) ? -1 : real(file, bytes, length, offset, room);
}
ssize_t __pread64_chk(int file, void* bytes, size_t length, off64_t offset, size_t room) {
  REAL(__pread64_chk)
  return fails(kRead, EIO) ? -1 : real(file, bytes, length, offset, room);
}
