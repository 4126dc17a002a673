#include "tools/stat/collect.h"

#include <algorithm>
#include <cerrno>
#include <chrono>
#include <cmath>
#include <csignal>
#include <optional>
#include <ostream>
#include <string>
#include <vector>

#include "base/arithmetic.h"
#include "base/civil_time.h"
#include "base/format.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/platform.h"
#include "tools/shared/table.h"
#include "tools/stat/collect_sources.h"
#include "tools/stat/stat_progress.h"

namespace tavrel {
namespace {

using Ticks = CollectPace::Ticks;

constexpr std::size_t kReadingsPerTransaction = 60;

struct TimedReading {
  std::int32_t day;
  std::uint32_t secondsInDay;
  Ticks at;
  MachineReading machine;
};

enum class Keeping : std::uint8_t {
  Latest,  // a scalar, replaced by each reading
  Sum,     // a scalar, added to by what happened since the reading before
  Series,  // a distribution, appended to by each reading
};

// Computes one statistic from a reading and the one before, which is null for the first. Nothing
// when it is unknown.
using Measure = std::optional<double> (*)(const MachineReading& now, const MachineReading* before,
                                          double secondsBetween);

struct Statistic {
  const char* key;
  Keeping keeping;
  Measure measure;
};

template <class Number>
std::optional<double> real(const std::optional<Number>& number, double divisor = 1) {
  if (!number) return std::nullopt;
  return static_cast<double>(*number) / divisor;
}

// The growth of a counter. A counter that has gone back was restarted or lost a device, and its
// growth is unknown.
std::optional<double> growth(std::uint64_t now, std::uint64_t before) {
  if (now < before) return std::nullopt;
  return static_cast<double>(now - before);
}

using TrafficMember = std::optional<MachineReading::Traffic> MachineReading::*;
using Direction = std::uint64_t MachineReading::Traffic::*;

template <TrafficMember traffic, Direction direction>
std::optional<double> kib(const MachineReading& now, const MachineReading* before, double) {
  if (!before || !(now.*traffic) || !(before->*traffic)) return std::nullopt;
  const auto bytes = growth((*(now.*traffic)).*direction, (*(before->*traffic)).*direction);
  return real(bytes, 1024);
}

template <TrafficMember traffic, Direction direction>
std::optional<double> kibPerSecond(const MachineReading& now, const MachineReading* before,
                                   double secondsBetween) {
  if (secondsBetween <= 0) return std::nullopt;
  return real(kib<traffic, direction>(now, before, 0), secondsBetween);
}

std::optional<double> busyTicks(const MachineReading& now, const MachineReading* before, double) {
  if (!before || !now.cpu || !before->cpu) return std::nullopt;
  return growth(now.cpu->busy, before->cpu->busy);
}

std::optional<double> busyPercent(const MachineReading& now, const MachineReading* before, double) {
  const auto busy = busyTicks(now, before, 0);
  if (!busy) return std::nullopt;
  const auto total = growth(now.cpu->total, before->cpu->total);
  if (!total || *total <= 0) return std::nullopt;
  return 100 * *busy / *total;
}

constexpr auto kNetwork = &MachineReading::network;
constexpr auto kDisk = &MachineReading::disk;
constexpr auto kIn = &MachineReading::Traffic::in;
constexpr auto kOut = &MachineReading::Traffic::out;

// One row per statistic. docs/collect.md says what each is; the help text lists the keys.
constexpr Statistic kStatistics[] = {
    {"com.norvane.usage.uptime.seconds", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.uptimeSeconds);
     }},
    {"com.norvane.usage.cpu.count", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) -> std::optional<double> {
       if (now.cpus == 0) return std::nullopt;
       return static_cast<double>(now.cpus);
     }},
    {"com.norvane.usage.processes", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) { return real(now.processes); }},
    {"com.norvane.usage.memory.total_mib", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.memoryTotalKib, 1024);
     }},
    {"com.norvane.usage.memory.available_mib", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.memoryAvailableKib, 1024);
     }},
    {"com.norvane.usage.swap.used_mib", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.swapUsedKib, 1024);
     }},
    {"com.norvane.usage.disk.total_mib", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.diskTotalMib);
     }},
    {"com.norvane.usage.disk.free_mib", Keeping::Latest,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.diskFreeMib);
     }},
    {"com.norvane.usage.samples", Keeping::Sum,
     [](const MachineReading&, const MachineReading*, double) { return std::optional<double>(1); }},
    {"com.norvane.usage.cpu.busy_milliseconds", Keeping::Sum,
     [](const MachineReading& now, const MachineReading* before, double) {
       return real(busyTicks(now, before, 0), static_cast<double>(ticksPerSecond()) / 1000);
     }},
    {"com.norvane.usage.network.received_kib", Keeping::Sum, kib<kNetwork, kIn>},
    {"com.norvane.usage.network.sent_kib", Keeping::Sum, kib<kNetwork, kOut>},
    {"com.norvane.usage.disk.read_kib", Keeping::Sum, kib<kDisk, kIn>},
    {"com.norvane.usage.disk.written_kib", Keeping::Sum, kib<kDisk, kOut>},
    {"com.norvane.usage.cpu.busy_percent", Keeping::Series, busyPercent},
    {"com.norvane.usage.load.one_minute", Keeping::Series,
     [](const MachineReading& now, const MachineReading*, double) {
       return real(now.loadOfOneMinute);
     }},
    {"com.norvane.usage.memory.used_percent", Keeping::Series,
     [](const MachineReading& now, const MachineReading*, double) -> std::optional<double> {
       if (!now.memoryTotalKib || !now.memoryAvailableKib || *now.memoryTotalKib == 0) {
         return std::nullopt;
       }
       return 100 - 100 * static_cast<double>(*now.memoryAvailableKib) /
                        static_cast<double>(*now.memoryTotalKib);
     }},
    {"com.norvane.usage.network.received_kib_per_second", Keeping::Series,
     kibPerSecond<kNetwork, kIn>},
    {"com.norvane.usage.network.sent_kib_per_second", Keeping::Series,
     kibPerSecond<kNetwork, kOut>},
    {"com.norvane.usage.disk.read_kib_per_second", Keeping::Series, kibPerSecond<kDisk, kIn>},
    {"com.norvane.usage.disk.written_kib_per_second", Keeping::Series, kibPerSecond<kDisk, kOut>},
    {"com.norvane.usage.temperature.celsius", Keeping::Series,
     [](const MachineReading& now, const MachineReading*, double) { return real(now.celsius); }},
};

class Collector {
 public:
  explicit Collector(ToolContext& context) : context_(context) {}

  void read(Ticks at) {
    Platform& platform = context_.platform();
    const auto now = saturatingInt64(std::floor(platform.clock->now().secondsSince1970()));
    readings_.push_back({platform.statistics->BHDaysSince1970(), secondOfDay(now), at,
                         readMachine(context_.root())});
    ++count_;
  }

  /// Writes the waiting readings, except for the last, with which the next one is compared.
  Status keep() {
    auto batch = context_.linuxPlatform().store().beginBatch();
    if (!batch) return batch.error();
    for (std::size_t i = kept_; i < readings_.size(); ++i) {
      const TimedReading* const before = i == 0 ? nullptr : &readings_[i - 1];
      if (Status done = keepReading(**batch, readings_[i], before); !done) return done;
    }
    if (Status done = (*batch)->commit(); !done) return done;
    readings_.erase(readings_.begin(), readings_.end() - 1);
    kept_ = 1;
    return Done{};
  }

  std::size_t waiting() const { return readings_.size() - kept_; }
  std::uint64_t count() const { return count_; }

  /// Statistics that no reading has given so far, with a blank before each.
  std::string missing() const {
    std::string keys;
    for (std::size_t i = 0; i < std::size(kStatistics); ++i) {
      if (!told_[i]) keys.append(" ").append(kStatistics[i].key);
    }
    return keys;
  }

 private:
  Status keepReading(SqliteBatch& batch, const TimedReading& now, const TimedReading* before) {
    const double secondsBetween =
        before ? std::chrono::duration<double>(now.at - before->at).count() : 0;
    for (std::size_t i = 0; i < std::size(kStatistics); ++i) {
      const Statistic& statistic = kStatistics[i];
      const auto value =
          statistic.measure(now.machine, before ? &before->machine : nullptr, secondsBetween);
      if (!value) continue;
      told_[i] = true;
      if (Status done = keepValue(batch, now, i, *value); !done) return done;
    }
    return Done{};
  }

  Status keepValue(SqliteBatch& batch, const TimedReading& now, std::size_t statistic,
                   double value) {
    const auto& [key, keeping, measure] = kStatistics[statistic];
    switch (keeping) {
      case Keeping::Latest:
        return batch.setScalar(now.day, key, saturatingInt64(value));
      case Keeping::Sum: {
        // A remainder below one stays for the next time.
        const double sum = value + fractions_[statistic];
        const double whole = std::floor(sum);
        fractions_[statistic] = sum - whole;
        return batch.addScalar(now.day, key, saturatingInt64(whole));
      }
      case Keeping::Series:
        return batch.appendValue(now.day, key, now.secondsInDay, value);
    }
    return Done{};
  }

  ToolContext& context_;
  std::vector<TimedReading> readings_;
  std::size_t kept_ = 0;
  std::uint64_t count_ = 0;
  double fractions_[std::size(kStatistics)] = {};
  bool told_[std::size(kStatistics)] = {};
};

// Holds SIGINT and SIGTERM back while it lives, so that what was sampled is kept when they come.
class EndSignals final : public CollectPace {
 public:
  EndSignals() {
    sigemptyset(&signals_);
    sigaddset(&signals_, SIGINT);
    sigaddset(&signals_, SIGTERM);
    pthread_sigmask(SIG_BLOCK, &signals_, &before_);
  }
  ~EndSignals() override {
    // One that came meanwhile asked for the end that this is.
    while (waitForOne(Ticks())) {
    }
    pthread_sigmask(SIG_SETMASK, &before_, nullptr);
  }
  EndSignals(const EndSignals&) = delete;
  EndSignals& operator=(const EndSignals&) = delete;

  Ticks now() override { return std::chrono::steady_clock::now(); }
  bool endsBefore(Ticks end) override { return waitForOne(end); }

 private:
  bool waitForOne(Ticks end) const {
    for (;;) {
      const auto left = std::max(end - std::chrono::steady_clock::now(), Ticks::duration::zero());
      const auto seconds = std::chrono::floor<std::chrono::seconds>(left);
      const timespec wait{.tv_sec = seconds.count(),
                          .tv_nsec = std::chrono::nanoseconds(left - seconds).count()};
      if (sigtimedwait(&signals_, nullptr, &wait) > 0) return true;
      if (errno != EINTR) return false;
    }
  }

  sigset_t signals_;
  sigset_t before_;
};

}  // namespace

void collectStatistics(ToolContext& context, std::uint32_t seconds, CollectPace& pace) {
  Collector collector(context);
  const Ticks start = pace.now();
  std::uint32_t second = 0;
  bool endsEarly = false;
  {
    StatProgress progress(context);
    for (;; ++second) {
      collector.read(pace.now());
      progress.show(format("collecting: %u of %u seconds", second, seconds));
      endsEarly = second < seconds && pace.endsBefore(start + std::chrono::seconds(second + 1));
      const bool isLast = second == seconds || endsEarly;
      if (!isLast && collector.waiting() < kReadingsPerTransaction) continue;
      if (const Status kept = collector.keep(); !kept) return context.fail(kept.error().message);
      if (isLast) break;
    }
  }
  context.out() << "kept " << counted(collector.count(), "sample")
                << " of this machine, taken over " << counted(second, "second") << '\n';
  if (endsEarly) context.note(format("ended by a signal before %u seconds were over", seconds));
  // One reading alone gives no rates, which needs no message.
  if (const std::string keys = collector.missing(); collector.count() > 1 && !keys.empty()) {
    context.note("not recorded, as the machine did not tell in this time:" + keys);
  }
}

void collectStatistics(ToolContext& context, std::uint32_t seconds) {
  EndSignals signals;
  collectStatistics(context, seconds, signals);
}

std::string_view collectedKeysHelp() {
  return "Scalars, under com.norvane.usage.:\n"
         "  uptime.seconds, cpu.count, processes, memory.total_mib, memory.available_mib,\n"
         "  swap.used_mib, disk.total_mib, disk.free_mib (the latest reading);\n"
         "  samples, cpu.busy_milliseconds, network.received_kib, network.sent_kib,\n"
         "  disk.read_kib, disk.written_kib (added up over the day's readings)\n"
         "Distributions, under com.norvane.usage.:\n"
         "  cpu.busy_percent, load.one_minute, memory.used_percent,\n"
         "  network.received_kib_per_second, network.sent_kib_per_second,\n"
         "  disk.read_kib_per_second, disk.written_kib_per_second, temperature.celsius";
}

}  // namespace tavrel
