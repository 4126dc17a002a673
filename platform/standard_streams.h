// Standard output and standard error, byte for byte; no line ends are added.
#pragma once

#include <string_view>

#include "base/format.h"

namespace tavrel {

class StandardStreams {
 public:
  virtual ~StandardStreams() = default;

  virtual void writeOutput(std::string_view text) = 0;
  virtual void writeError(std::string_view text) = 0;

  template <class... Arguments>
  void printError(FormatOf<Arguments...> text, const Arguments&... arguments) {
    writeError(format(text, arguments...));
  }
};

}  // namespace tavrel
