// A device root in a temporary folder, a system log that keeps its lines, and child processes.
#pragma once

#include <algorithm>
#include <filesystem>
#include <fstream>
#include <functional>
#include <gtest/gtest.h>
#include <iterator>
#include <stdlib.h>
#include <string>
#include <string_view>
#include <sys/stat.h>
#include <sys/wait.h>
#include <unistd.h>
#include <utility>
#include <vector>

#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/system_log.h"

namespace tavrel {

using Lines = std::vector<std::string>;

inline std::string contentOf(const std::filesystem::path& path) {
  std::ifstream file(path, std::ios::binary);
  return {std::istreambuf_iterator<char>(file), {}};
}

/// Lets a test interfere, once, before a file whose path has this part is opened.
struct MeddlingFiles : FileSystem {
  int openFile(const char* path, int flags, mode_t mode) override {
    if (std::string_view(path).find(part) != std::string_view::npos) {
      if (const auto now = std::exchange(meddle, nullptr)) now();
    }
    return FileSystem::openFile(path, flags, mode);
  }
  std::string part;
  std::function<void()> meddle;
};

/// Removes itself with all its contents at the end.
class TemporaryRoot {
  const std::string folder_ = makeFolder();

 public:
  TemporaryRoot() = default;
  TemporaryRoot(const TemporaryRoot&) = delete;
  TemporaryRoot& operator=(const TemporaryRoot&) = delete;
  ~TemporaryRoot() { std::filesystem::remove_all(folder_); }

  /// Writes the file at a path of the device.
  void write(std::string_view path, std::string_view content) const {
    const std::filesystem::path file = root.path(path);
    std::filesystem::create_directories(file.parent_path());
    std::ofstream stream(file, std::ios::binary);
    stream << content;
    ASSERT_TRUE(stream.flush()) << file;
  }
  const DeviceRoot root{folder_};

 private:
  static std::string makeFolder() {
    umask(022);  // files that other users may write are not trusted
    // In memory where possible, because tests flush and rename thousands of times.
    const bool inMemory = access("/dev/shm", W_OK) == 0;
    const std::filesystem::path parent =
        inMemory ? "/dev/shm" : std::filesystem::temp_directory_path();
    std::string name = parent / "tavrel-test-XXXXXX";
    EXPECT_NE(mkdtemp(name.data()), nullptr) << name;
    return name;
  }
};

class KeptLog final : public SystemLog {
 public:
  void write(LogLevel, std::string_view message) override { lines.emplace_back(message); }
  bool says(std::string_view part) const {
    return std::ranges::any_of(
        lines, [part](const std::string& line) { return line.find(part) != line.npos; });
  }
  Lines lines;
};

/// The exit status of `body`, run in a separate process.
inline int inChild(const std::function<int()>& body) {
  const pid_t child = fork();
  if (child == 0) _exit(body());
  int status = 0;
  EXPECT_EQ(waitpid(child, &status, 0), child);
  return WIFEXITED(status) ? WEXITSTATUS(status) : -1;
}

}  // namespace tavrel
