// Kernel return codes: 0 for success, otherwise one of the errors below or a driver's own code.
#pragma once

#include <cstdint>

namespace tavrel {

using KernelReturn = std::uint32_t;

inline constexpr KernelReturn kKernelSuccess = 0;
inline constexpr KernelReturn kKernelError = 0xE00002BC;
inline constexpr KernelReturn kKernelNoMemory = 0xE00002BD;
inline constexpr KernelReturn kKernelBadArgument = 0xE00002C2;
inline constexpr KernelReturn kKernelInternalError = 0xE00002C9;
inline constexpr KernelReturn kKernelIOError = 0xE00002CA;
inline constexpr KernelReturn kKernelUnsupportedMode = 0xE00002E6;
inline constexpr KernelReturn kKernelUnderrun = 0xE00002E7;
inline constexpr KernelReturn kKernelAborted = 0xE00002EB;
inline constexpr KernelReturn kKernelNotFound = 0xE00002F0;

}  // namespace tavrel
