// A device in a temporary folder, with tavrelctl to operate it.
#pragma once

#include <algorithm>
#include <chrono>
#include <csignal>
#include <cstdint>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <nlohmann/json.hpp>
#include <sstream>
#include <string>
#include <sys/inotify.h>
#include <unistd.h>
#include <vector>

#include "base/format.h"
#include "platform/linux/files/descriptor.h"
#include "platform/plist/xml.h"
#include "tests/devices/temporary_root.h"
#include "tests/helpers/command_line.h"
#include "tools/console/json_value.h"
#include "tools/tavrelctl.h"

namespace tavrel {

using namespace nlohmann::literals;

inline constexpr const char* kWhitelistFile =
    "/Library/Application Support/Brimhold/Whitelist_Pellio.plist";
inline const std::string kStore = "/var/mobile/Library/Brimhold/BHDataStore.sqlitedb";
inline const std::string kSubmission = "/var/mobile/Library/Logs/Submission/";

/// Expects a text to have each of these parts.
inline void expectIn(const std::string& text, std::initializer_list<std::string> parts) {
  for (const std::string& part : parts)
    EXPECT_NE(text.find(part), text.npos) << part << "\nis not in\n" << text.substr(0, 4000);
}

/// The number of the current day.
inline std::int32_t today() {
  const auto now = std::chrono::system_clock::now().time_since_epoch();
  return static_cast<std::int32_t>(std::chrono::duration_cast<std::chrono::days>(now).count());
}

/// An XML property list, written here as JSON.
inline std::string xmlOf(std::string_view json) {
  const auto value = parseJsonValue(json);
  EXPECT_TRUE(value) << value.error().message;
  return *plist::writeXml(*value);
}

/// A blocked signal that has arrived and waits, until a command takes it.
class PendingSignal {
 public:
  explicit PendingSignal(int signal) {
    sigset_t set;
    sigemptyset(&set);
    sigaddset(&set, signal);
    pthread_sigmask(SIG_BLOCK, &set, &before_);
    raise(signal);
  }
  ~PendingSignal() { pthread_sigmask(SIG_SETMASK, &before_, nullptr); }
  PendingSignal(const PendingSignal&) = delete;
  PendingSignal& operator=(const PendingSignal&) = delete;

 private:
  sigset_t before_;
};

/// Counts how often a file is opened.
class Openings {
 public:
  explicit Openings(const std::string& path) {
    // Equal events in a row become one, so closing has events, too.
    EXPECT_GE(inotify_add_watch(events_.get(), path.c_str(), IN_OPEN | IN_CLOSE), 0) << path;
  }

  /// Since the last call.
  int take() {
    int count = 0;
    inotify_event event{};
    while (::read(events_.get(), &event, sizeof event) == sizeof event)
      count += (event.mask & IN_OPEN) != 0 ? 1 : 0;
    return count;
  }

 private:
  const Descriptor events_{inotify_init1(IN_NONBLOCK | IN_CLOEXEC)};
};

struct Outcome {
  int status;
  std::string out, error;

  bool operator==(const Outcome&) const = default;
  friend std::ostream& operator<<(std::ostream& stream, const Outcome& outcome) {
    return stream << "status " << outcome.status << "\n--- out\n"
                  << outcome.out << "--- error\n"
                  << outcome.error << "---";
  }
};

/// Only `out`, with status 0.
inline Outcome prints(std::string out) {
  return {0, std::move(out), {}};
}

/// Only `error`, in the tool's form, with status 1 by default.
inline Outcome fails(const std::string& error, int status = 1) {
  return {status, {}, "tavrelctl: " + error + "\n"};
}

class TemporaryDevice : public TemporaryRoot {
 public:
  std::string path(std::string_view devicePath) const { return root.path(devicePath); }

  /// Every file below the root with its content, to check that nothing has changed.
  std::vector<std::pair<std::string, std::string>> files() const {
    std::vector<std::pair<std::string, std::string>> list;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(path(""))) {
      if (entry.is_regular_file()) list.emplace_back(entry.path(), contentOf(entry.path()));
    }
    std::sort(list.begin(), list.end());
    return list;
  }

  Outcome run(const CommandLine& command, const std::string& input = {},
              std::optional<std::size_t> columns = std::nullopt) const {
    return runAt(path(""), command, input, columns);
  }

  /// Runs a command as a user who owns nothing here, if this user is root.
  Outcome runAsAnother(const CommandLine& command) const {
    const uid_t user = geteuid();
    EXPECT_EQ(user == 0 ? seteuid(65534) : 0, 0);
    const Outcome outcome = run(command);
    EXPECT_EQ(seteuid(user), 0);
    return outcome;
  }

  static Outcome runAt(const std::string& root, CommandLine command, const std::string& input = {},
                       std::optional<std::size_t> columns = std::nullopt) {
    std::istringstream in(input);
    std::ostringstream out, error;
    command.insert(command.begin(), {"--root", root});
    const int status =
        runTavrelctl(command, {.in = in, .out = out, .error = error, .columns = columns});
    return {status, out.str(), error.str()};
  }

  void check(const CommandLine& command, const Outcome& expected, const std::string& input = {},
             std::optional<std::size_t> columns = std::nullopt) const {
    EXPECT_EQ(run(command, input, columns), expected) << testing::PrintToString(command);
  }

  /// What a command prints with --json.
  nlohmann::json json(const CommandLine& command, const std::string& input = {},
                      int status = 0) const {
    const Outcome outcome = run(command.with("--json"), input);
    EXPECT_EQ(outcome.status, status) << outcome;
    const auto json = nlohmann::json::parse(outcome.out, nullptr, false);
    EXPECT_EQ(json.value("format_version", 0), 1) << outcome;
    return json;
  }

  /// A reading of a drive's health; figures and `more` members of it are JSON.
  void writeDrive(const std::string& name, const std::string& kind, const std::string& figures,
                  const std::string& time = "2026-01-01T00:00:00Z",
                  const std::string& more = "") const {
    write("/run/tavrel/health/" + name + ".plist",
          xmlOf(R"({"version": 1, "name": ")" + name + R"(", "kind": ")" + kind +
                R"(", "time": {"$date": ")" + time + R"("}, )" + more + R"("figures": {)" +
                figures + "}}"));
  }

  /// Files a log with metadata in a submission folder ("pending/NAME").
  void fileLog(const std::string& name, std::string_view content,
               const std::string& metadata) const {
    write(kSubmission + name + ".log", content);
    write(kSubmission + name + ".metadata.plist", xmlOf(metadata));
  }
};

/// Tests with a device each. A suite without further helpers is an alias of this.
struct DeviceTest : testing::Test {
  // Tests and programs look at the clock one after the other, and should see the same day.
  void SetUp() override {
    if (std::time(nullptr) % 86'400 > 86'400 - 60) GTEST_SKIP() << "the day is about to end";
  }
  const TemporaryDevice device{};
};

}  // namespace tavrel
