// Descriptors that the service manager has opened for this process.
#pragma once

namespace tavrel {

/// The first of them; the standard streams come before.
inline constexpr int kFirstActivatedDescriptor = 3;

/// How many descriptors the environment variables LISTEN_PID and LISTEN_FDS pass to `process`; 0
/// when they are for another process, absent or not positive numbers. There is no upper bound.
int activatedDescriptors(int process);

}  // namespace tavrel
