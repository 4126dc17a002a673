// Descriptors that the service manager has opened for a process.
#pragma once

namespace tavrel {

/// The first of them, after the standard streams.
inline constexpr int kFirstActivatedDescriptor = 3;

/// How many LISTEN_PID and LISTEN_FDS of the environment hand over to the process; 0 when they are
/// not for this one, absent or not positive numbers. There is no upper bound.
int activatedDescriptors(int process);

}  // namespace tavrel
