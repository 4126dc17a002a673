/* A program of several processes that records what it does, one of which is killed.
 *
 *   workers MILLISECONDS
 *
 * Each of four workers computes for that time, job after job. The second one is killed halfway. */
#define _DEFAULT_SOURCE
#include <brimhold/client.h>
#include <signal.h>
#include <stdatomic.h>
#include <stdbool.h>
#include <stdio.h>
#include <stdlib.h>
#include <sys/mman.h>
#include <sys/wait.h>
#include <time.h>
#include <unistd.h>

enum { kWorkers = 4, kKilled = 1, kRounds = 200000 };

static void sleepMilliseconds(long milliseconds) {
  struct timespec time = {milliseconds / 1000, milliseconds % 1000 * 1000000};
  nanosleep(&time, NULL);
}

struct Shared {
  atomic_bool stop;
  atomic_long jobs[kWorkers];
};

static void work(struct Shared* shared, int worker) {
  BHClientScalarKey* jobs = BHClientScalarForKey("com.example.jobs");
  BHClientDistributionKey* duration = BHClientDistributionForKey("com.example.job.milliseconds");
  for (unsigned job = 0; !shared->stop; ++job) {
    BHClientTimer timer = BHClientTimerStart();
    volatile unsigned sum = job;
    for (unsigned round = 0; round < kRounds * (1 + job % 4); ++round)
      sum = sum * 31 + round;
    BHClientTimerStopMilliseconds(timer, duration);
    BHClientScalarAdd(jobs, 1);
    ++shared->jobs[worker];
    sleepMilliseconds(1);
  }
}

int main(int argc, char** argv) {
  const long milliseconds = argc > 1 ? atol(argv[1]) : 1000;
  struct Shared* shared =
      mmap(NULL, sizeof *shared, PROT_READ | PROT_WRITE, MAP_SHARED | MAP_ANONYMOUS, -1, 0);
  if (shared == MAP_FAILED) return 1;
  pid_t workers[kWorkers];
  for (int i = 0; i < kWorkers; ++i) {
    workers[i] = fork();
    if (workers[i] < 0) return 1;
    if (workers[i] == 0) {
      work(shared, i);
      return 0;
    }
  }
  sleepMilliseconds(milliseconds / 2);
  kill(workers[kKilled], SIGKILL);
  sleepMilliseconds(milliseconds - milliseconds / 2);
  shared->stop = true;

  long sum = 0;
  for (int i = 0; i < kWorkers; ++i) {
    waitpid(workers[i], NULL, 0);
    sum += shared->jobs[i];
  }
  printf("%d workers did %ld jobs; one of them was killed after its job %ld\n", kWorkers, sum,
         shared->jobs[kKilled]);
}
