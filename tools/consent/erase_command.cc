#include "tools/consent/erase_command.h"

#include <istream>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>

#include "base/format.h"
#include "platform/linux/linux_platform.h"
#include "platform/linux/logs/file_submission.h"
#include "platform/linux/logs/record_file_name.h"
#include "platform/linux/store/sqlite_store.h"
#include "platform/platform.h"
#include "tools/consent/fold_everything.h"
#include "tools/console/day_argument.h"
#include "tools/console/table.h"

namespace tavrel {
namespace {

struct Arguments {
  bool all = false;
  std::string prefix;
  std::string from;
  std::string to;
  bool yes = false;
};

/// What to erase. Records belong to days; a log does not belong to a single day.
struct Scope {
  RowRange rows;
  bool records = false;
  bool logs = false;
  std::string text;  // "all statistics, records and logs"
};

struct Erased {
  ErasedRows rows;
  std::size_t recordFiles = 0;
  std::size_t asideFiles = 0;
  std::size_t logs = 0;
};

/// Nothing when the arguments are wrong, after a message.
std::optional<Scope> scopeOf(ToolContext& context, const Arguments& given) {
  const bool hasDays = !given.from.empty() || !given.to.empty();
  const bool hasPrefix = !given.prefix.empty();
  std::string fault;
  if (given.all == (hasPrefix || hasDays)) {
    fault = given.all ? "--all erases everything: leave --key, --from and --to out"
                      : "name what to erase: --all, or --key PREFIX, --from DAY and --to DAY";
  } else if (hasDays && (given.from.empty() || given.to.empty())) {
    fault = "give both --from DAY and --to DAY: both days are included";
  }
  Scope scope{.rows = {}, .records = !hasPrefix, .logs = given.all, .text = {}};
  if (fault.empty() && hasDays) {
    const std::int32_t today = context.platform().statistics->BHDaysSince1970();
    const auto from = parseDay(given.from, today);
    const auto to = parseDay(given.to, today);
    if (!from || !to) {
      fault = (from ? to : from).error().message;
    } else if (*from > *to) {
      fault = format("no days: %s is after %s", dayText(*from), dayText(*to));
    } else {
      scope.rows.firstDay = *from;
      scope.rows.lastDay = *to;
    }
  }
  if (!fault.empty()) {
    context.failUsage(fault);
    return std::nullopt;
  }
  scope.rows.prefix = given.prefix;
  scope.text = given.all   ? "all statistics, records and logs"
               : hasPrefix ? format("the statistics whose keys begin with %s", given.prefix)
                           : "the statistics and records";
  if (hasDays) {
    scope.text +=
        format(" of days %s to %s", dayText(scope.rows.firstDay), dayText(scope.rows.lastDay));
  }
  return scope;
}

bool isConfirmed(ToolContext& context, const Scope& scope, bool yes) {
  if (yes) return true;
  if (!context.canAsk()) {
    context.failUsage("not a terminal: add --yes to erase without asking");
    return false;
  }
  context.error() << "Erase " << printable(scope.text) << " below "
                  << printable(context.root().path("/")) << "? Type yes: " << std::flush;
  std::string answer;
  std::getline(context.in(), answer);
  if (answer == "yes") return true;
  context.fail("nothing is erased");
  return false;
}

/// Removes the files of a folder for which `isMeant` returns true, and counts them.
template <class IsMeant>
Expected<std::size_t> removeFiles(FileSystem& files, const std::string& folder, IsMeant isMeant) {
  const auto names = files.list(folder);
  if (!names) return names.error();
  std::size_t count = 0;
  for (const std::string& name : *names) {
    if (!isMeant(name)) continue;
    if (Status removed = files.remove(folder + "/" + name); !removed) return removed.error();
    ++count;
  }
  if (count > 0) {
    if (Status flushed = files.flushFolder(folder); !flushed) return flushed.error();
  }
  return count;
}

Expected<std::size_t> removeRecords(ToolContext& context, const RowRange& range) {
  return removeFiles(context.linuxPlatform().fileSystem(), context.root().path(kRecordFolder),
                     [&range](const std::string& name) {
                       const auto file = parseRecordFileName(name);
                       return file && file->day >= range.firstDay && file->day <= range.lastDay;
                     });
}

/// Damaged stores, and damaged files of kept values, that were set aside.
bool isSetAside(const std::string& name, const std::string& store) {
  return name.starts_with(store + ".corrupt-") || name == store + "-kept-damaged";
}

/// What a killed process left of a new version of the values kept beside the store.
Status discardHalfWritten(FileSystem& files, const std::string& folder) {
  if (!FileSystem::status(folder)) return Done{};
  const auto lock = files.lockFolder(folder);
  if (!lock) return lock.error();
  files.discardTemporaries(folder);
  return files.flushFolder(folder);
}

/// Erases in steps. A failure ends it, and the next call does the rest; only values that cannot be
/// folded do not stop the other steps. Logs go last: a run that begins after the rows are gone
/// makes no new ones from them.
Status erase(ToolContext& context, const Scope& scope, Erased& erased) {
  LinuxPlatform& device = context.linuxPlatform();
  const Status folded = foldEverything(context);
  FileSystem& files = device.fileSystem();
  const auto rows = device.store().erase(scope.rows);
  if (!rows) return rows.error();
  erased.rows = *rows;
  const std::string& store = device.store().path();
  const std::size_t slash = store.rfind('/');
  const std::string folder = store.substr(0, slash);
  if (Status discarded = discardHalfWritten(files, folder); !discarded) return discarded;
  if (scope.logs) {
    const std::string name = store.substr(slash + 1);
    const auto aside = removeFiles(
        files, folder, [&name](const std::string& file) { return isSetAside(file, name); });
    if (!aside) return aside.error();
    erased.asideFiles = *aside;
    const std::string metrics = context.root().path("/run/tavrel/metrics");
    files.discardTemporaries(metrics);
    if (Status removed = files.remove(metrics + "/tavrel.prom"); !removed) return removed;
  }
  if (scope.records) {
    const auto records = removeRecords(context, scope.rows);
    if (!records) return records.error();
    erased.recordFiles = *records;
  }
  if (scope.logs) {
    const RemovedLogs removed = device.submission().removeAll();
    erased.logs = removed.logs;
    if (removed.failure) return *removed.failure;
  }
  return folded;
}

void print(ToolContext& context, const Scope& scope, const Erased& erased) {
  const ErasedRows& rows = erased.rows;
  if (context.json()) {
    return context.printJson({{"scalars", rows.scalars},
                              {"distributions", rows.distributions},
                              {"values", rows.values},
                              {"damaged_distributions", rows.damaged},
                              {"record_files", erased.recordFiles},
                              {"files_set_aside", erased.asideFiles},
                              {"logs", erased.logs},
                              {"store_copied", rows.isCopied},
                              {"log_of_store_emptied", rows.isLogEmpty}});
  }
  const auto count = [](std::size_t number, std::string_view what) {
    return counted(std::uint64_t{number}, what);
  };
  std::ostream& out = context.out();
  if (rows.scalars + rows.distributions + rows.damaged + erased.recordFiles + erased.asideFiles +
          erased.logs ==
      0) {
    out << "nothing to erase\n";
    return;
  }
  out << "erased: " << counted(rows.scalars, "scalar") << ", "
      << counted(rows.distributions, "distribution") << " of " << counted(rows.values, "value");
  if (scope.records) out << ", " << count(erased.recordFiles, "file") << " of records";
  if (scope.logs) {
    out << ", " << count(erased.logs, "log") << ", " << count(erased.asideFiles, "damaged file");
  }
  out << '\n';
}

void noteWhatStays(ToolContext& context, const Scope& scope, const Erased& erased) {
  const ErasedRows& rows = erased.rows;
  if (!rows.isLogEmpty) {
    context.fail(
        "another process uses the store: its write-ahead log still has what was erased: run it "
        "again when that process has ended");
  }
  if (!rows.isCopied) {
    context.note(
        "the store is too large to copy: unused parts of its pages may still hold keys or values "
        "that were erased");
  }
  if (scope.logs) return;
  if (rows.damaged > 0) {
    context.fail(
        format("the values of %s could not be found in the damaged store: "
               "'tavrelctl erase --all' removes them",
               counted(rows.damaged, "distribution")));
  }
  if (rows.scalars + rows.distributions == 0) return;
  FileSubmission& submission = context.linuxPlatform().submission();
  std::size_t logs = 0;
  using enum FileSubmission::Place;
  for (const auto place : {Pending, Outbox}) {
    const auto found = submission.count(place);
    logs += found ? *found : 0;
  }
  if (logs > 0) {
    context.note(
        format("%s may report what was erased: 'tavrelctl deny' deletes what waits, and withdraws "
               "the permission",
               counted(std::uint64_t{logs}, "waiting log")));
  }
}

void run(ToolContext& context, const Arguments& arguments) {
  const auto scope = scopeOf(context, arguments);
  if (!scope || !isConfirmed(context, *scope, arguments.yes)) return;
  Erased erased;
  const Status done = erase(context, *scope, erased);
  if (!done) {
    return context.fail(
        format("not everything is erased: %s, then run it again", done.error().message));
  }
  print(context, *scope, erased);
  noteWhatStays(context, *scope, erased);
}

}  // namespace

void addEraseCommand(Command app, ToolContext& context) {
  const auto arguments = std::make_shared<Arguments>();
  const Command command =
      app.addCommand("erase", "Erase statistics, records and logs that the device keeps");
  command.addFlag("--all", arguments->all,
                  "All statistics, records and logs, except logs that were sent");
  command.addOption("--key", arguments->prefix, "Only statistics whose keys begin with this")
      .typeName("PREFIX");
  command
      .addOption("--from", arguments->from,
                 "The first day: today, yesterday, a day number or YYYY-MM-DD, UTC")
      .typeName("DAY");
  command.addOption("--to", arguments->to, "The last day").typeName("DAY");
  command.addFlag("--yes", arguments->yes, "Do not ask");
  command.setFooter(
      "Without --key, the structured records of the days are erased too. Preferences stay. See\n"
      "tavrelctl(1).");
  context.addJsonOption(command);
  command.onRun([&context, arguments] { run(context, *arguments); });
}

}  // namespace tavrel
