#include <fcntl.h>
#include <string.h>
#include <sys/random.h>
#include <sys/stat.h>
#include <sys/syscall.h>
#include <unistd.h>

#include "internal.h"

/* Direct system calls: the C library's functions are cancellation points. */
static size_t readSmallFile(const char* path, char* text, size_t size) {
  const int file = (int)syscall(SYS_openat, AT_FDCWD, path, O_RDONLY | O_CLOEXEC);
  if (file < 0) return 0;
  const long length = syscall(SYS_read, file, text, size);
  syscall(SYS_close, file);
  return length > 0 ? (size_t)length : 0;
}

static int digitOf(char character) {
  if (character >= '0' && character <= '9') return character - '0';
  if (character >= 'a' && character <= 'f') return character - 'a' + 10;
  return -1;
}

static void readBoot(unsigned char boot[16]) {
  char text[64];
  const size_t length = readSmallFile("/proc/sys/kernel/random/boot_id", text, sizeof text);
  size_t digits = 0;
  for (size_t i = 0; i < length && digits < 32; ++i) {
    const int digit = digitOf(text[i]);
    if (digit < 0) continue;
    boot[digits / 2] = (unsigned char)(boot[digits / 2] << 4 | digit);
    ++digits;
  }
}

/* Field 22 of /proc/self/stat. The second field, the program's name in parentheses, may contain
 * anything. */
static uint64_t startTime(void) {
  char text[1024];
  const size_t length = readSmallFile("/proc/self/stat", text, sizeof text);
  size_t at = length;
  while (at > 0 && text[at - 1] != ')')
    --at;
  for (int field = 2; field < 22; ++field) {
    while (at < length && text[at] != ' ')
      ++at;
    ++at;
  }
  uint64_t time = 0;
  for (; at < length && text[at] >= '0' && text[at] <= '9'; ++at)
    time = time * 10 + (uint64_t)(text[at] - '0');
  return time;
}

static void makeIdentity(unsigned char identity[16]) {
  if (syscall(SYS_getrandom, identity, 16, GRND_NONBLOCK) == 16) return;
  /* No random bytes yet, early after boot. The identity need only be unique per user. */
  struct timespec now = {0};
  clock_gettime(CLOCK_BOOTTIME, &now);
  const uint64_t parts[2] = {
      (uint64_t)now.tv_sec * 1000000000U + (uint64_t)now.tv_nsec,
      (uint64_t)getpid() << 32 ^ (uint64_t)syscall(SYS_gettid) ^ (uint64_t)(uintptr_t)identity};
  memcpy(identity, parts, 16);
}

void bhDescribeProcess(struct Segment* segment) {
  segment->version = kBHSegmentVersion;
  segment->bytes = kBHSegmentBytes;
  segment->pid = (uint32_t)getpid();
  segment->start = startTime();
  makeIdentity(segment->identity);
  readBoot(segment->boot);
  struct stat status;
  if (stat("/proc/self/ns/pid", &status) == 0) segment->pidNamespace = status.st_ino;
}
