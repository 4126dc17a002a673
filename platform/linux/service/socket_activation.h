// Sockets that the service manager has opened for this process and hands over on descriptors from
// 3 on, as LISTEN_PID, LISTEN_FDS and LISTEN_FDNAMES say.
#pragma once

#include <string_view>

#include "platform/linux/files/descriptor.h"
#include "platform/system_log.h"

namespace tavrel {

/// The listening sequenced-packet socket that was handed over for the service `name`, ready to be
/// used without blocking: the one that is called so in LISTEN_FDNAMES, else the only one there is.
/// None when nothing was handed over to this process, or nothing that fits, which is logged. The
/// environment stays as it is, and what was handed over stays open, so that clients can connect
/// until the process ends; no child inherits it.
Descriptor activatedSocket(std::string_view name, SystemLog& log);

}  // namespace tavrel
