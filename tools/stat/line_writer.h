// Collects lines and writes them in large pieces.
#pragma once

#include <cstddef>
#include <ostream>
#include <string>

namespace tavrel {

class LineWriter {
 public:
  /// The stream must outlive it.
  explicit LineWriter(std::ostream& out) : out_(out) {}
  ~LineWriter() { flush(); }
  LineWriter(const LineWriter&) = delete;
  LineWriter& operator=(const LineWriter&) = delete;

  std::string& buffer() { return buffer_; }
  /// False when the stream accepts no more.
  bool flushIfLarge() { return buffer_.size() < kLargeBytes || flush(); }
  bool flush() {
    out_.write(buffer_.data(), static_cast<std::streamsize>(buffer_.size()));
    buffer_.clear();
    return out_.good();
  }

 private:
  static constexpr std::size_t kLargeBytes = 1U << 16;

  std::ostream& out_;
  std::string buffer_;
};

}  // namespace tavrel
