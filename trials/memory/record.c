/* Uses all of libbrimhold from four threads, and again from a child. Built with MemorySanitizer, it
 * ends at the first use of uninitialised memory. Exits with 1 when recording reports an unexpected
 * status. Link with -Wl,--wrap=syscall. */
#include <brimhold/client.h>
#include <pthread.h>
#include <stdarg.h>
#include <stdio.h>
#include <string.h>
#include <sys/syscall.h>
#include <sys/wait.h>
#include <unistd.h>

enum { kThreads = 4, kValues = 20000, kKeys = 300, kLongest = 1100, kArguments = 5 };

/* GCC, which analyses this file, has no header that declares it. */
void __msan_unpoison(const volatile void* address, size_t bytes);
long __real_syscall(long number, ...);
long __wrap_syscall(long number, ...);

/* The sanitizer does not see what a direct system call writes. */
long __wrap_syscall(long number, ...) {
  va_list list;
  va_start(list, number);
  long arguments[kArguments];
  for (int i = 0; i < kArguments; ++i)
    arguments[i] = va_arg(list, long);
  va_end(list);
  __msan_unpoison(arguments, sizeof arguments); /* those that the call does not have */
  const long result =
      __real_syscall(number, arguments[0], arguments[1], arguments[2], arguments[3], arguments[4]);
  if (number == SYS_read && result > 0) __msan_unpoison((void*)arguments[1], (size_t)result);
  return result;
}

/* Keys of all lengths, including some longer than the library accepts. */
static void* record(void* thread) {
  char key[kLongest + 16];
  for (int i = 0; i < kValues; ++i) {
    const int which = (i * 7 + *(const int*)thread) % kKeys;
    snprintf(key, sizeof key, "com.example.%0*d", 1 + which * which % kLongest, which);
    if (i % 3 == 0) {
      BHClientScalarAdd(BHClientScalarForKey(key), i);
    } else if (i % 3 == 1) {
      BHClientScalarSet(BHClientScalarForKey(key), i);
    } else {
      BHClientDistributionKey* values = BHClientDistributionForKey(key);
      BHClientTimer timer = BHClientTimerStart();
      BHClientDistributionRecord(values, i);
      BHClientTimerStopSeconds(timer, values);
      BHClientTimerStopMilliseconds(timer, values);
    }
  }
  return NULL;
}

static int says(BHClientStatus expected) {
  const char* text = "";
  if (BHClientGetStatus(&text) == expected && strlen(text) > 0) return 1;
  fprintf(stderr, "status %d: %s\n", (int)BHClientGetStatus(NULL), text);
  return 0;
}

static int recordInThreads(void) {
  pthread_t threads[kThreads];
  int numbers[kThreads];
  for (int i = 0; i < kThreads; ++i) {
    numbers[i] = i;
    if (pthread_create(&threads[i], NULL, record, &numbers[i]) != 0) return 0;
  }
  for (int i = 0; i < kThreads; ++i)
    pthread_join(threads[i], NULL);
  return says(BHClientStatusKeyRefused);
}

int main(void) {
  if (!says(BHClientStatusNoKey) || !recordInThreads()) return 1;
  const pid_t child = fork();
  if (child == 0) _exit(!recordInThreads());
  int status = 1;
  return waitpid(child, &status, 0) != child || status != 0;
}
