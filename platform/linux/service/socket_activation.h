// Sockets that the service manager has opened for this process and passed as descriptors from 3 on,
// described by LISTEN_PID, LISTEN_FDS and LISTEN_FDNAMES.
#pragma once

#include <string_view>

#include "platform/linux/files/descriptor.h"
#include "platform/system_log.h"

namespace tavrel {

/// The listening sequenced-packet socket passed for the service `name`, in non-blocking mode: the
/// one with that name in LISTEN_FDNAMES, otherwise the only one. None when this process got no
/// sockets or, with a line in the log, none that fits. The environment stays unchanged, and the
/// sockets stay open, so that clients can connect until the process ends; no child inherits them.
Descriptor activatedSocket(std::string_view name, SystemLog& log);

}  // namespace tavrel
