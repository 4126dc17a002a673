// The system log. Every entry has a level; texts are reproduced exactly.
#pragma once

#include <cstdint>
#include <string_view>

#include "base/format.h"

namespace tavrel {

enum class LogLevel : std::uint8_t { Debug, Info, Default, Error };

class SystemLog {
 public:
  virtual ~SystemLog() = default;

  /// Writes one entry; it may have several lines.
  virtual void write(LogLevel level, std::string_view message) = 0;

  template <class... Arguments>
  void log(LogLevel level, FormatOf<Arguments...> text, const Arguments&... arguments) {
    write(level, format(text, arguments...));
  }
};

}  // namespace tavrel
