// Log lines about refusals, of which there are only so many.
#pragma once

#include <chrono>
#include <string_view>

#include "platform/system_log.h"

namespace tavrel {

/// Writes lines about refusals until there were `limits::kRefusalLinesPerMinute` of them in a
/// minute, and then says how many were left out. The log must outlive it.
class RefusalLog {
 public:
  explicit RefusalLog(SystemLog& log) : log_(log) {}
  RefusalLog(const RefusalLog&) = delete;
  RefusalLog& operator=(const RefusalLog&) = delete;
  ~RefusalLog();
  void write(std::string_view line);

 private:
  void sayLeftOut();

  SystemLog& log_;
  std::chrono::steady_clock::time_point minuteBegan_{};
  int written_ = 0;
  int leftOut_ = 0;
};

}  // namespace tavrel
