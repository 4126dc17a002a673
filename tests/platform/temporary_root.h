// A device root in a temporary folder, and a system log that is kept.
#pragma once

#include <filesystem>
#include <fstream>
#include <gtest/gtest.h>
#include <stdlib.h>
#include <string>
#include <string_view>
#include <unistd.h>
#include <vector>

#include "platform/linux/device_root.h"
#include "platform/system_log.h"

namespace tavrel {

/// Removed with everything in it at the end.
class TemporaryRoot {
 public:
  TemporaryRoot() : folder_(makeFolder()), root(folder_) {}
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

 private:
  static std::string makeFolder() {
    // In memory where that can be had: tests flush and rename by the thousand.
    const bool inMemory = access("/dev/shm", W_OK) == 0;
    const std::filesystem::path parent =
        inMemory ? "/dev/shm" : std::filesystem::temp_directory_path();
    std::string name = parent / "tavrel-test-XXXXXX";
    EXPECT_NE(mkdtemp(name.data()), nullptr) << name;
    return name;
  }

  std::string folder_;

 public:
  const DeviceRoot root;
};

class KeptLog final : public SystemLog {
 public:
  void write(LogLevel, std::string_view message) override { lines.emplace_back(message); }
  std::vector<std::string> lines;
};

}  // namespace tavrel
