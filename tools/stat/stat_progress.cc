#include "tools/stat/stat_progress.h"

#include <ostream>

namespace tavrel {

// Carriage return, then "erase to the end of the line".
constexpr std::string_view kLineStart = "\r\x1b[K";

StatProgress::~StatProgress() {
  if (shown_) context_.error() << kLineStart << std::flush;
}

void StatProgress::show(std::string_view text) {
  if (!context_.showsProgress()) return;
  const auto now = std::chrono::steady_clock::now();
  if (now < next_) return;
  next_ = now + std::chrono::milliseconds(250);
  context_.error() << kLineStart << text << std::flush;
  shown_ = true;
}

void StatProgress::showCount(std::string_view what, std::uint64_t count) {
  show(std::string(what) + ": " + std::to_string(count) + " rows");
}

}  // namespace tavrel
