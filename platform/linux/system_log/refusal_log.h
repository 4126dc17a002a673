// Log lines about refusals, limited in number.
#pragma once

#include <chrono>
#include <string_view>

#include "platform/system_log.h"

namespace tavrel {

/// Writes at most `limits::kRefusalLinesPerMinute` lines about refusals in a minute, and then says
/// how many were left out. The log must outlive it.
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
