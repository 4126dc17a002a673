#include <fcntl.h>
#include <linux/magic.h>
#include <pthread.h>
#include <string.h>
#include <sys/mman.h>
#include <sys/resource.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <sys/vfs.h>
#include <unistd.h>

#include "internal.h"

#ifndef MADV_POPULATE_WRITE
#define MADV_POPULATE_WRITE 23
#endif

/* Direct system calls: the C library's functions are cancellation points. */
static int openFile(int folder, const char* name, int flags, int mode) {
  return (int)syscall(SYS_openat, folder, name, flags | O_CLOEXEC, mode);
}
static void closeFile(int file) {
  syscall(SYS_close, file);
}

static BHClientStatus statusOf(int error) {
  switch (error) {
    case ENOENT:
    case ENOTDIR:
      return BHClientStatusNoFolder;
    case EACCES:
    case EPERM:
    case EROFS:
      return BHClientStatusNotAllowed;
    case ENOSPC:
    case EDQUOT:
    case EFBIG:
    case ENOMEM:
    case EAGAIN: /* memory could not be locked */
    case EMFILE:
    case ENFILE:
    case EFAULT: /* memory could not be allocated */
      return BHClientStatusNoSpace;
    default:
      return BHClientStatusFailed;
  }
}

static char* appendHex(char* to, uint64_t number) {
  for (int shift = 60; shift >= 0; shift -= 4)
    *to++ = "0123456789abcdef"[number >> shift & 15];
  return to;
}

/* Of the root folder and the mount namespace: with others, the segment's path leads elsewhere. */
static uint64_t rootFolder(void) {
  struct stat root = {0};
  struct stat mounts = {0};
  (void)stat("/", &root);
  (void)stat("/proc/self/ns/mnt", &mounts);
  return (uint64_t)root.st_dev << 32 ^ (uint64_t)root.st_ino ^ (uint64_t)mounts.st_ino << 16;
}

static struct SegmentName makeName(unsigned attempt) {
  struct timespec now = {0};
  clock_gettime(CLOCK_MONOTONIC, &now);
  return (struct SegmentName){
      (uint64_t)now.tv_sec * 1000000000U + (uint64_t)now.tv_nsec + attempt,
      (uint64_t)syscall(SYS_gettid),
      rootFolder(),
  };
}

/* "<time>-<thread>.segment" */
static void writeName(char to[64], struct SegmentName name) {
  to = appendHex(to, name.time);
  *to++ = '-';
  to = appendHex(to, name.thread);
  memcpy(to, ".segment", sizeof ".segment");
}

void bhForgetMapping(struct Segment* segment) {
  (void)mmap(segment, kBHSegmentBytes, PROT_READ | PROT_WRITE,
             MAP_PRIVATE | MAP_ANONYMOUS | MAP_NORESERVE | MAP_FIXED, -1, 0);
}

static int openFolder(const char* folder) {
  return openFile(AT_FDCWD, folder, O_PATH | O_DIRECTORY, 0);
}

void bhPostFoldWanted(const char* folder) {
  const int directory = openFolder(folder);
  if (directory < 0) return;
  const int file =
      openFile(directory, "fold-wanted", O_WRONLY | O_CREAT | O_EXCL | O_NOFOLLOW, 0600);
  if (file >= 0) closeFile(file);
  closeFile(directory);
}

/* Checked first, since growing a file beyond the limit would raise SIGXFSZ. */
static bool mayMakeFilesThatLarge(void) {
  struct rlimit limit;
  return getrlimit(RLIMIT_FSIZE, &limit) != 0 || limit.rlim_cur >= kBHSegmentBytes;
}

/* Whether the file system has its reserve free beside these bytes. */
static bool leavesReserve(int file, size_t bytes) {
  struct statfs fileSystem;
  if (fstatfs(file, &fileSystem) != 0) return false;
  const size_t blocks = bytes / (size_t)fileSystem.f_bsize;
  if (fileSystem.f_bavail >= fileSystem.f_blocks / kReservedPart + blocks) return true;
  errno = ENOSPC;
  return false;
}

/* The C library's function, unlike syscall(), passes 64-bit lengths correctly on 32-bit machines.
 * It is a cancellation point, but not while cancellation is off. */
static bool allocateFile(int file) {
  int before;
  pthread_setcancelstate(PTHREAD_CANCEL_DISABLE, &before);
  const bool isDone = fallocate(file, 0, 0, kBHSegmentBytes) == 0;
  pthread_setcancelstate(before, NULL);
  return isDone;
}

static struct Segment* mapSegment(int file) {
  if (!mayMakeFilesThatLarge()) {
    errno = EFBIG;
    return NULL;
  }
  if (ftruncate(file, kBHSegmentBytes) != 0) return NULL;
  void* memory = mmap(NULL, kBHSegmentBytes, PROT_READ | PROT_WRITE, MAP_SHARED, file, 0);
  if (memory == MAP_FAILED) return NULL;
  struct Segment* segment = memory;

  bool isThere = madvise(segment, kBHKeyTable, MADV_POPULATE_WRITE) == 0;
  /* Before Linux 5.14, memory can be allocated only through the file, so allocate all of it now. */
  if (!isThere && errno == EINVAL) {
    isThere = leavesReserve(file, kBHSegmentBytes) && allocateFile(file);
  }
  if (!isThere) {
    const int error = errno;
    munmap(segment, kBHSegmentBytes);
    errno = error;
    return NULL;
  }
  return segment;
}

bool bhFetch(const void* from, size_t bytes) {
  const size_t before = (uintptr_t)from & ((size_t)sysconf(_SC_PAGESIZE) - 1);
  int result;
  do {
    result = madvise((char*)from - before, before + bytes, MADV_POPULATE_WRITE);
  } while (result != 0 && errno == EINTR);
  return result == 0 || errno == EINVAL;
}

static struct Segment* beginIn(int directory, struct SegmentName* made, BHClientStatus* status) {
  char name[64];
  int file = -1;
  for (unsigned attempt = 0; attempt < kNameAttempts; ++attempt) {
    *made = makeName(attempt);
    writeName(name, *made);
    file = openFile(directory, name, O_RDWR | O_CREAT | O_EXCL | O_NOFOLLOW, 0600);
    if (file >= 0 || errno != EEXIST) break;
  }
  if (file < 0) {
    *status = statusOf(errno);
    return NULL;
  }
  struct Segment* segment = mapSegment(file);
  if (!segment) {
    *status = statusOf(errno);
    unlinkat(directory, name, 0);
  } else {
    bhDescribeProcess(segment);
    atomic_store_explicit(&segment->magic, kBHSegmentMagic, memory_order_release);
  }
  closeFile(file);
  return segment;
}

struct Segment* bhBeginSegment(const char* folder, struct SegmentName* name,
                               BHClientStatus* status) {
  const int directory = openFolder(folder);
  if (directory < 0) {
    *status = statusOf(errno);
    return NULL;
  }
  struct Segment* segment = NULL;
  struct statfs fileSystem;
  struct stat entries;
  if (fstatfs(directory, &fileSystem) != 0 || fileSystem.f_type != TMPFS_MAGIC) {
    *status = BHClientStatusNotInMemory;
  } else if (!leavesReserve(directory, 0)) {
    *status = BHClientStatusNoSpace;
  } else {
    segment = beginIn(directory, name, status);
    /* On a tmpfs, the size of a folder is 20 bytes per entry, "." and ".." included. */
    if (fstat(directory, &entries) == 0 && entries.st_size / 20 - 2 > kFilesBeforeFold &&
        name->time % kSegmentsPerFold == 0) {
      bhPostFoldWanted(folder);
    }
  }
  closeFile(directory);
  return segment;
}

void bhAbandonSegment(const char* folder, struct SegmentName name, struct Segment* segment) {
  munmap(segment, kBHSegmentBytes);
  const int directory = openFolder(folder);
  if (directory < 0) return;
  char file[64];
  writeName(file, name);
  unlinkat(directory, file, 0);
  closeFile(directory);
}

/* A lack of memory or descriptors says nothing about the rights of the process. */
static bool mayLater(int error) {
  const BHClientStatus status = statusOf(error);
  return status != BHClientStatusNoFolder && status != BHClientStatusNotAllowed;
}

BHClientStatus bhStatusOfFile(const char* folder, struct SegmentName name) {
  char ownFile[64];
  writeName(ownFile, name);
  struct stat entry;
  const int directory = openFolder(folder);
  const bool isThere =
      directory >= 0 && fstatat(directory, ownFile, &entry, AT_SYMLINK_NOFOLLOW) == 0;
  int error = isThere ? 0 : errno;
  const bool isRemoved = error == ENOENT && rootFolder() == name.root;
  if (directory >= 0 && mayLater(error)) {
    /* An unnamed file needs the same rights. Where the kernel lacks faccessat2(), the C library's
     * faccessat() would judge the real user instead of the effective one. */
    const int file = openFile(directory, ".", O_TMPFILE | O_WRONLY, 0600);
    error = file >= 0 ? 0 : errno;
    if (file >= 0) closeFile(file);
  }
  if (directory >= 0) closeFile(directory);
  if (isRemoved) return BHClientStatusRemoved;
  return mayLater(error) ? BHClientStatusRecording : BHClientStatusCannotAsk;
}
