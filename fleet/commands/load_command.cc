#include "fleet/commands/load_command.h"

#include <filesystem>
#include <memory>
#include <nlohmann/json.hpp>
#include <ostream>
#include <sys/stat.h>

#include "base/format.h"
#include "fleet/loading/load.h"
#include "platform/linux/files/system_error.h"

namespace tavrel::fleet {
namespace {

struct LoadOptions {
  LoadRequest request;
  std::string setAside;
};

// A line of the terminal that each new text overwrites.
class Progress {
 public:
  explicit Progress(FleetContext& context) : context_(context) {}
  ~Progress() { clear(); }
  Progress(const Progress&) = delete;
  Progress& operator=(const Progress&) = delete;
  void show(const LoadCounts& counts) {
    if (!context_.showsProgress()) return;
    context_.error() << format("\r%zu loaded, %zu known, %zu refused", counts.loaded, counts.known,
                               counts.refused)
                     << std::flush;
    isShown_ = true;
  }
  void clear() {
    if (isShown_) context_.error() << "\r\x1b[K" << std::flush;
    isShown_ = false;
  }

 private:
  FleetContext& context_;
  bool isShown_ = false;
};

void printCounts(FleetContext& context, const LoadCounts& counts) {
  if (context.json()) {
    return context.printJson({{"loaded", counts.loaded},
                              {"known", counts.known},
                              {"refused", counts.refused},
                              {"others", counts.others},
                              {"left_to_next_load", counts.tooNew},
                              {"without_metadata", counts.withoutMetadata}});
  }
  context.out() << format("%zu loaded, %zu known, %zu refused", counts.loaded, counts.known,
                          counts.refused);
  if (counts.others != 0) context.out() << format("; %zu of another kind", counts.others);
  if (counts.tooNew != 0) context.out() << format("; %zu left to the next load", counts.tooNew);
  if (counts.withoutMetadata != 0)
    context.out() << format("; %zu without metadata", counts.withoutMetadata);
  context.out() << '\n';
}

void load(FleetContext& context, const LoadOptions& options) {
  Progress progress(context);
  const LoadListener listener = {
      .note =
          [&](std::string_view line) {
            progress.clear();
            context.note(line);
          },
      .progress = [&](const LoadCounts& counts) { progress.show(counts); }};
  for (const auto* named :
       {&options.request.paths, &options.request.uploadLines, &options.request.whitelists}) {
    for (const std::string& path : *named) {
      if (struct stat status{}; stat(path.c_str(), &status) != 0)
        return context.fail(systemError("read", path).message + ": check the path");
    }
  }
  for (const std::string& path : options.request.paths) {
    // Loading a folder within it does not load what is set aside.
    std::error_code missing;
    const bool isFolder = std::filesystem::is_directory(path, missing);
    const auto place =
        isFolder ? std::filesystem::path(path) : std::filesystem::absolute(path).parent_path();
    if (std::filesystem::equivalent(place, options.setAside, missing)) {
      return context.failUsage(
          format("--set-aside: %s is loaded itself: name another folder", options.setAside));
    }
  }
  const auto engine = context.openDatabase(OpenMode::Write);
  LoadRequest request = options.request;
  if (!options.setAside.empty()) request.setAside = options.setAside;
  const auto counts = load(*engine, request, listener);
  progress.clear();
  if (!counts) return context.fail(counts.error().message);
  printCounts(context, *counts);
  if (counts->refused != 0) context.setExitStatus(kExitFailure);
}

}  // namespace

void addLoadCommand(Command top, FleetContext& context) {
  const Command command = top.addCommand("load", "File logs in the tables");
  auto options = std::make_shared<LoadOptions>();
  command.addOption("PATH", options->request.paths, "Logs, folders with logs, tar archives")
      .typeName("")
      .required()
      .notEmpty();
  command
      .addOption("--metadata", options->request.uploadLines,
                 "Lines of JSON in which a server records the metadata of uploads")
      .typeName("FILE");
  command
      .addOption(
          "--whitelist", options->request.whitelists,
          "Refuse logs whose whitelist is not given here, or does not name one of their keys")
      .typeName("FILE");
  command
      .addOption("--set-aside", options->setAside, "Folder for copies of refused logs with reasons")
      .typeName("DIR");
  context.addJsonOption(command);
  command.setFooter(
      "The exit status is 1 when a log was refused; the others are loaded, or left to the next "
      "load.");
  command.onRun([&context, options] { load(context, *options); });
}

}  // namespace tavrel::fleet
