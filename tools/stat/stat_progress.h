// Shows the progress of long work on a terminal; silent in a pipe.
#pragma once

#include <chrono>
#include <cstdint>
#include <string_view>

#include "tools/shared/tool_context.h"

namespace tavrel {

/// One line that is overwritten at most four times a second and removed at the end.
class StatProgress {
 public:
  /// The context must outlive it.
  explicit StatProgress(ToolContext& context) : context_(context) {}
  ~StatProgress();
  StatProgress(const StatProgress&) = delete;
  StatProgress& operator=(const StatProgress&) = delete;

  void show(std::string_view text);
  /// Shows "WHAT: COUNT rows". For loops too fast to check the clock in each round.
  void count(std::string_view what, std::uint64_t count) {
    if (count % kRowsBetweenLooks == 0 && context_.showsProgress()) showCount(what, count);
  }

 private:
  static constexpr std::uint64_t kRowsBetweenLooks = 16384;
  void showCount(std::string_view what, std::uint64_t count);

  ToolContext& context_;
  std::chrono::steady_clock::time_point next_{};
  bool shown_ = false;
};

}  // namespace tavrel
