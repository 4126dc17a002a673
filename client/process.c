#include <pthread.h>
#include <stdlib.h>
#include <string.h>
#include <sys/mman.h>
#include <unistd.h>

#include "internal.h"

static _Atomic(struct Process*) theProcess;

struct Process* bhProcess(void) {
  return atomic_load_explicit(&theProcess, memory_order_acquire);
}

static void* mapMemory(size_t bytes) {
  void* memory = mmap(NULL, bytes, PROT_READ | PROT_WRITE, MAP_PRIVATE | MAP_ANONYMOUS, -1, 0);
  return memory == MAP_FAILED ? NULL : memory;
}

static bool findFolder(char folder[kLongestFolder]) {
  static const char kFolder[] = "/run/tavrel/stat";
  /* A program that runs with more rights than its caller must not take paths from the caller. */
  const char* root = secure_getenv("TAVREL_ROOT");
  size_t length = root ? strlen(root) : 0;
  while (length > 0 && root[length - 1] == '/')
    --length;
  size_t start = 0;
  if (length > 0 && root[0] != '/') {
    /* The program may leave its working directory. */
    if (!getcwd(folder, kLongestFolder - 1)) return false;
    start = strlen(folder);
    folder[start++] = '/';
  }
  if (length + sizeof kFolder > kLongestFolder - start) return false;
  /* NOLINTNEXTLINE(bugprone-not-null-terminated-result): the next copy appends the zero */
  if (length > 0) memcpy(folder + start, root, length);
  memcpy(folder + start + length, kFolder, sizeof kFolder);
  return true;
}

/* If this fails, a child drops its parent's segment only at its first value. */
__attribute__((constructor)) static void registerForForks(void) {
  pthread_atfork(NULL, NULL, bhForgetParent);
}

struct Process* bhMakeProcess(BHClientStatus* status) {
  struct Process* known = bhProcess();
  if (known) return known;

  struct Process* process = mapMemory(sizeof *process);
  struct State* state = mapMemory(sizeof *state);
  *status = process && state ? BHClientStatusUnsupported : BHClientStatusNoSpace;
  if (process && state && findFolder(process->folder) &&
      madvise(state, sizeof *state, MADV_WIPEONFORK) == 0) {
    process->state = state;
    if (atomic_compare_exchange_strong_explicit(&theProcess, &known, process, memory_order_acq_rel,
                                                memory_order_acquire)) {
      return process;
    }
  }
  if (process) munmap(process, sizeof *process);
  if (state) munmap(state, sizeof *state);
  return known;
}
