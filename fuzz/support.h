// What targets share that play files of a device: a log that nobody reads, and a tree of
// files that holds nothing of earlier inputs.
#pragma once

#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <filesystem>
#include <fstream>
#include <string>
#include <string_view>
#include <system_error>

#include "base/bytes.h"
#include "platform/linux/files/device_root.h"
#include "platform/system_log.h"
#include "require.h"

namespace tavrel::fuzz {

class SilentLog final : public SystemLog {
 public:
  void write(LogLevel, std::string_view message) override {
    ++lines;
    require(!message.empty());
  }
  std::size_t lines = 0;
};

/// Takes bytes off the front of the input.
class Input {
 public:
  Input(const std::uint8_t* data, std::size_t size)
      : rest_(reinterpret_cast<const char*>(data), size) {}

  /// 0 at the end.
  unsigned byte() { return static_cast<unsigned char>(upTo(1).append(1, '\0').front()); }
  std::string upTo(std::size_t most) {
    std::string taken(rest_.substr(0, most));
    rest_.remove_prefix(taken.size());
    return taken;
  }
  /// Up to the next byte 0xFF, which texts do not have; that is taken, too.
  std::string part() {
    std::string taken = upTo(std::min(rest_.find('\xFF'), rest_.size()));
    upTo(1);
    return taken;
  }
  bool empty() const { return rest_.empty(); }
  /// Little-endian; what the input lacks is 0.
  std::uint64_t word(std::size_t bytes) {
    std::uint64_t taken = 0;
    for (std::size_t i = 0; i < bytes; ++i)
      taken |= std::uint64_t{byte()} << (8 * i);
    return taken;
  }
  std::string_view text() const { return rest_; }
  ByteSpan bytes() const { return asBytes(rest_); }

 private:
  std::string_view rest_;
};

/// A device root in memory. It is removed with the object, so that an input never sees what an
/// earlier one has left.
class Tree {
 public:
  Tree() {
    require(mkdtemp(folder_.data()) != nullptr);
    root = DeviceRoot(folder_);
  }
  ~Tree() {
    std::error_code ignored;
    std::filesystem::remove_all(folder_, ignored);
  }
  Tree(const Tree&) = delete;
  Tree& operator=(const Tree&) = delete;

  void write(std::string_view path, std::string_view content) {
    const std::filesystem::path file = root.path(path);
    std::filesystem::create_directories(file.parent_path());
    std::ofstream(file, std::ios::binary) << content;
  }

  DeviceRoot root{"/"};

 private:
  std::string folder_ = "/dev/shm/tavrel-fuzz-XXXXXX";
};

}  // namespace tavrel::fuzz
