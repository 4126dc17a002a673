// Other ways to record: the tool, Python and StatsD.
#include "recording.h"

namespace tavrel {
namespace {

const std::string kTool = TAVREL_BUILD "/bin/tavrelctl ";

/// Programs use the machine's clock.
class Programs : public Recording {
 protected:
  Programs() { testClock().realtime = 0; }

  // All scalars of today, as text.
  std::string foldedScalars() {
    fold();
    std::string text;
    for (const auto& [keyAndDay, value] : scalars)
      text += keyAndDay.first + "=" + std::to_string(value) + " ";
    return text;
  }
};

TEST_F(Programs, TheToolRecordsIntoMemory) {
  EXPECT_EQ(outputOf(kTool + "stat add n +2"), "");
  EXPECT_EQ(outputOf(kTool + "--root " + root.string() + " stat add n 3"), "");
  EXPECT_EQ(outputOf(kTool + "stat set com.norvane.g -7"), "");
  EXPECT_EQ(outputOf(kTool + "stat record d -- 1.5 -2"), "");
  EXPECT_EQ(segments().size(), 4U);
  EXPECT_EQ(foldedScalars(), "com.norvane.g=-7 n=5 ");
  EXPECT_EQ(records["d"], (std::vector<double>{1.5, -2}));
  EXPECT_FALSE(std::filesystem::exists(root / "var"));
}

TEST_F(Programs, TheToolSaysWhyItCannotRecord) {
  if (geteuid() != 0) GTEST_SKIP() << "not root, so the user cannot be changed";
  const std::string asNobody = "setpriv --reuid=65534 --clear-groups " + kTool;
  chmod(root.c_str(), 0755);
  EXPECT_EQ(outputOf(asNobody + "stat add n 1", 1),
            "tavrelctl: cannot create files in " + folder.string() +
                ": run as root or join the group brimhold\n");
  chmod(folder.c_str(), 01777);
  EXPECT_EQ(outputOf(asNobody + "stat add n 1"), "");
  const auto refused = [](const std::string& key) {
    return "tavrelctl: this user may not record " + key +
           ": run as root, take another key, or name the user in /etc/tavrel/recorders.plist\n";
  };
  EXPECT_EQ(outputOf(asNobody + "stat add com.norvane.n 1", 1), refused("com.norvane.n"));
  std::filesystem::create_directories(root / "etc/tavrel");
  outputOf("echo '{\"65534\": [\"com.norvane.n\"]}' | " + kTool + "plist convert - -o " +
           (root / "etc/tavrel/recorders.plist").string());
  EXPECT_EQ(outputOf(asNobody + "stat add com.norvane.n 2"), "");
  EXPECT_EQ(outputOf(asNobody + "stat add n 1", 1), refused("n"));
  // A file size limit that is too small belongs to the process.
  EXPECT_EQ(outputOf("ulimit -f 8; " + kTool + "stat add n 1", 1),
            "tavrelctl: cannot record in " + folder.string() +
                ": less than an eighth of its tmpfs is free, or a limit of this process is "
                "exhausted: run 'tavrelctl stat fold' or free space in /run\n");
  EXPECT_EQ(foldedScalars(), "com.norvane.n=2 n=1 ");
  std::filesystem::remove_all(folder);
  std::filesystem::remove_all(root / "var");
  EXPECT_EQ(outputOf(asNobody + "stat add n 1", 1),
            "tavrelctl: statistics store " + (root / "var/mobile/Library/Brimhold/").string() +
                "BHDataStore.sqlitedb: its folder cannot be made: Permission denied: check owner "
                "and permissions of " +
                root.string() + "\n");
}

TEST_F(Programs, CollectsOnceWithRatesSinceTheRunBefore) {
  const auto write = [&](const std::string& path, const std::string& content) {
    std::filesystem::create_directories((root / path).parent_path());
    std::ofstream(root / path) << content;
  };
  const std::string state = (root / "run/tavrel/collect.state").string();
  const std::string once = kTool + "stat collect --once";
  const auto sums = [&] {
    std::string text = foldedScalars();
    const auto end = text.find("com.norvane.usage.cpu.count");
    return text.substr(0, end) +
           "samples=" + std::to_string(records["com.norvane.usage.load.one_minute"].size());
  };
  write("proc/sys/kernel/random/boot_id", "boot-1\n");
  write("proc/loadavg", "0.5 0 0 1/1 1\n");
  const auto receive = [&](int bytes) {
    write("proc/net/dev", "\n\neth0: " + std::to_string(bytes) + " 0 0 0 0 0 0 0 0 0\n");
  };
  receive(0);
  write("proc/stat", "cpu  10 0 0 90 0 0 0 0\ncpu0 1\n");
  EXPECT_EQ(outputOf(once), "");
  EXPECT_EQ(sums(), "samples=1");
  write("proc/stat", "cpu  17 0 0 103 0 0 0 0\ncpu0 1\n");
  EXPECT_EQ(outputOf(once), "");
  EXPECT_EQ(sums(), "com.norvane.usage.cpu.busy_milliseconds=70 samples=2");
  EXPECT_EQ(records["com.norvane.usage.cpu.busy_percent"], std::vector<double>{35});

  // A remainder below one KiB is kept for the next run.
  for (const int bytes : {1536, 3072}) {
    receive(bytes);
    EXPECT_EQ(outputOf(once), "");
  }
  EXPECT_NE(foldedScalars().find("network.received_kib=3 "), std::string::npos);

  // It is not compared with a reading from another boot, nor with a file that is not a reading.
  write("proc/stat", "cpu  20 0 0 110 0 0 0 0\ncpu0 1\n");
  write("proc/sys/kernel/random/boot_id", "boot-2\n");
  EXPECT_EQ(outputOf(once), "");
  for (const char* damaged :
       {"", "tavrel-collect 2\nend\n", "tavrel-collect 1\nboot boot-2\nat 5\n",
        "tavrel-collect 1\nboot boot-2\nat -5\nend\n", "tavrel-collect 1\n\nend\n",
        "tavrel-collect 1\ncpu 1\nend\n", "tavrel-collect 1\nremainder k 1\nend\n",
        "tavrel-collect 1\nremainder k nan\nend\n"}) {
    write("run/tavrel/collect.state", damaged);
    EXPECT_EQ(outputOf(once), "tavrelctl: this sample has no rates: " + state +
                                  " is not a reading of 'tavrelctl stat collect': it is replaced\n")
        << damaged;
  }
  write("run/tavrel/collect.state", std::string(10'000, 'x'));
  EXPECT_TRUE(outputOf(once).starts_with("tavrelctl: this sample has no rates: "));
  // A reading from the future.
  write("run/tavrel/collect.state",
        "tavrel-collect 1\nboot boot-2\nat 9000000000000000000\ncpu 0 0\nend\n");
  EXPECT_EQ(outputOf(once), "");
  EXPECT_EQ(sums(), "com.norvane.usage.cpu.busy_milliseconds=70 samples=15");
  EXPECT_TRUE(outputOf(once + " --state " + folder.string(), 1).ends_with("Is a directory\n"));
}

TEST_F(Programs, TheSamplerEndsWhenItsFileIsRemoved) {
  EXPECT_EQ(outputOf("exec 2>&1; timeout 60 " + kTool +
                         "stat collect --every 1 & while kill -0 $! && ! rm " + folder.string() +
                         "/*.segment; do :; done 2>/dev/null; wait $!",
                     1),
            "tavrelctl: this program's file in " + folder.string() +
                " was removed: what it recorded since then is lost: start it again\n");
}

TEST_F(Programs, AForkedChildThatExecutesRecordsForItself) {
  run([&] {
    add(1);
    const pid_t child = start([] {
      add(10);
      execlp("sh", "sh", "-c", (TAVREL_BUILD "/bin/tavrelctl stat add count 100"), nullptr);
    });
    EXPECT_EQ(waitFor(child), 0);
    add(1000);
  });
  EXPECT_EQ(segments().size(), 3U);
  fold();
  std::int64_t sum = 0;
  for (const auto& [keyAndDay, value] : scalars)
    sum += value;
  EXPECT_EQ(sum, 1111);
}

TEST_F(Programs, PythonRecords) {
  const std::string program = R"(
import asyncio, brimhold, contextlib, functools, inspect, os, pickle
import subprocess, sys
count, gauge = brimhold.Scalar('py.count'), brimhold.Scalar('py.gauge')
series, timed = brimhold.Distribution('py.series'), brimhold.Distribution('py.timed')
count.add(); count.add(True); gauge.set(-2**63); series.record(1)
with timed.timer(): pass
@timed.timer(milliseconds=True)
def double(x): return 2 * x
try:
    with timed.timer(): raise KeyError
except KeyError: print(double(4), double.__name__)
@timed.timer()
async def later(): return 9
print(inspect.iscoroutinefunction(later), asyncio.run(later()))
# Neither looks like a coroutine function.
hidden = brimhold.Distribution('py.hidden')
class Waits:
    async def __call__(self): await asyncio.sleep(.01); return 1
def passed_on(function):
    @functools.wraps(function)
    def call(): return function()
    return call
print([asyncio.run(hidden.timer()(waits)()) for waits in (Waits(), passed_on(Waits().__call__))])
# Everything else is passed on as it is.
class Request:
    def __await__(self): return iter(())
    def send(self, value): raise StopIteration
    def throw(self, *error): raise StopIteration
    def close(self): pass
called = brimhold.Distribution('py.called')
def numbers(): yield 1
async def signals(): yield 1
returned = [Request(), numbers(), signals(), contextlib.contextmanager(numbers)()]
print([called.timer()(lambda: one)() is one for one in returned])
one = timed.timer()
def nest():
    with one, one: pass
def pickled_while_it_runs():
    running = brimhold.Distribution('py.none').timer()
    running.__enter__()
    pickle.dumps(running)
for wrong in (lambda: count.add(2**63), lambda: count.add(1.5), lambda: series.record('x'),
              lambda: count.add(10**5000), lambda: series.record(10**400),
              nest, lambda: one(numbers), lambda: one(signals), pickled_while_it_runs,
              lambda: brimhold.Scalar(b'a'), lambda: brimhold.Scalar(None),
              lambda: brimhold.Scalar(''), lambda: brimhold.Scalar('a\n'),
              lambda: brimhold.Distribution('ü' * 513)):
    try: wrong()
    except Exception as error: print(type(error).__name__, end=' ')
print(brimhold.status(), flush=True)
# In another process, the addresses of this one mean nothing.
subprocess.run([sys.executable, '-B', '-c', """
import brimhold, pickle, sys
brimhold.Scalar('py.other').add()
scalar, record, timer = pickle.load(sys.stdin.buffer)
scalar.add(10); record(2)
with timer: pass
"""], input=pickle.dumps((count, series.record, timed.timer(milliseconds=True))), check=True)
if os.fork() == 0: count.add(30)
else: os.wait()
)";
  setenv("PROGRAM", program.c_str(), 1);
  EXPECT_EQ(outputOf(kPython + "PYTHONPATH=" TAVREL_SOURCE "/client/python "
                               "BRIMHOLD_LIBRARY=" TAVREL_BUILD "/client/libbrimhold.so.1 "
                               "python3 -B -c \"$PROGRAM\""),
            "8 double\nTrue 9\n[1, 1]\n[True, True, True, True]\n"
            "OverflowError TypeError TypeError OverflowError OverflowError RuntimeError TypeError "
            "TypeError TypeError TypeError TypeError "
            "ValueError ValueError ValueError (<Status.RECORDING: 0>, 'values are recorded')\n");
  EXPECT_EQ(foldedScalars(), "py.count=42 py.gauge=-9223372036854775808 py.other=1 ");
  EXPECT_EQ(records["py.series"], (std::vector<double>{1, 2}));
  EXPECT_EQ(records["py.timed"].size(), 6U);
  EXPECT_EQ(records["py.called"].size(), 4U);
  ASSERT_EQ(records["py.hidden"].size(), 2U);
  for (const double measured : records["py.hidden"])
    EXPECT_GE(measured, 0.01);
}

}  // namespace
}  // namespace tavrel
