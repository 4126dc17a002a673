// A device in a temporary folder, and tavrelctl on it.
#pragma once

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <sstream>
#include <string>
#include <vector>

#include "platform/plist/xml.h"
#include "tests/platform/temporary_root.h"
#include "tools/shared/json_value.h"
#include "tools/tavrelctl.h"

namespace tavrel {

inline constexpr const char* kWhitelistFile =
    "/Library/Application Support/Brimhold/Whitelist_Pellio.plist";

/// A property list in its XML form, written here as JSON.
inline std::string xmlOf(std::string_view json) {
  const auto value = parseJsonValue(json);
  EXPECT_TRUE(value) << value.error().message;
  return *plist::writeXml(*value);
}

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

/// `out` alone, with status 0.
inline Outcome prints(std::string out) {
  return {0, std::move(out), {}};
}

/// `error` alone, as the tool says it, with status 1 unless told otherwise.
inline Outcome fails(const std::string& error, int status = 1) {
  return {status, {}, "tavrelctl: " + error + "\n"};
}

class TemporaryDevice : public TemporaryRoot {
 public:
  std::string path(std::string_view devicePath) const { return root.path(devicePath); }

  /// Every file below the root with its content, so that "nothing has changed" can be seen.
  std::vector<std::pair<std::string, std::string>> files() const {
    std::vector<std::pair<std::string, std::string>> list;
    for (const auto& entry : std::filesystem::recursive_directory_iterator(path(""))) {
      if (entry.is_regular_file()) list.emplace_back(entry.path(), contentOf(entry.path()));
    }
    std::sort(list.begin(), list.end());
    return list;
  }

  Outcome run(std::vector<std::string> arguments, const std::string& input = {},
              std::optional<std::size_t> columns = std::nullopt) const {
    return runAt(path(""), std::move(arguments), input, columns);
  }

  static Outcome runAt(const std::string& root, std::vector<std::string> arguments,
                       const std::string& input = {},
                       std::optional<std::size_t> columns = std::nullopt) {
    std::istringstream in(input);
    std::ostringstream out;
    std::ostringstream error;
    arguments.insert(arguments.begin(), {"--root", root});
    const int status =
        runTavrelctl(arguments, {.in = in, .out = out, .error = error, .columns = columns});
    return {status, out.str(), error.str()};
  }
};

}  // namespace tavrel
