// What a run of the daemon is for: the daemon takes it from the command line, the record of the
// last run keeps it.
#pragma once

#include <cstdint>

namespace tavrel {

enum class RunKind : std::uint8_t {
  Daily,    // yesterday's tasks, unless they have been done
  Forced,   // yesterday's tasks
  Today,    // today's tasks
  Service,  // serves clients
};

}  // namespace tavrel
