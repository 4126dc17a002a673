// The standard streams of the process.
#pragma once

#include "platform/standard_streams.h"

namespace tavrel {

class LinuxStandardStreams final : public StandardStreams {
 public:
  void writeOutput(std::string_view text) override;
  void writeError(std::string_view text) override;
};

}  // namespace tavrel
