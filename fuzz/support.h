// Code that targets share: reading the input part by part, and a log that nobody reads.
#pragma once

#include <algorithm>
#include <cstdint>
#include <string>
#include <string_view>

#include "base/bytes.h"
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

  /// 0 at the end of the input.
  unsigned byte() { return static_cast<unsigned char>(upTo(1).append(1, '\0').front()); }
  std::string upTo(std::size_t most) {
    std::string taken(rest_.substr(0, most));
    rest_.remove_prefix(taken.size());
    return taken;
  }
  /// Takes the bytes up to the next 0xFF, which texts do not contain, and drops the 0xFF.
  std::string part() {
    std::string taken = upTo(std::min(rest_.find('\xFF'), rest_.size()));
    upTo(1);
    return taken;
  }
  bool empty() const { return rest_.empty(); }
  /// A little-endian number; bytes that the input lacks are 0.
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

}  // namespace tavrel::fuzz
