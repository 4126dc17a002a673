// The standard streams of the process. Under the journal, text on standard error becomes an entry
// at debug level: it shows developers how a run went, and at a higher level would look like an
// error.
#pragma once

#include "platform/linux/system_log/linux_system_log.h"
#include "platform/standard_streams.h"

namespace tavrel {

class LinuxStandardStreams final : public StandardStreams {
 public:
  /// The log must outlive it.
  explicit LinuxStandardStreams(LinuxSystemLog& log) : log_(log) {}

  void writeOutput(std::string_view text) override;
  void writeError(std::string_view text) override;

 private:
  LinuxSystemLog& log_;
};

}  // namespace tavrel
