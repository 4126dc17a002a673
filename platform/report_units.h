// Unit codes of report channels and of the health figures of drives, which such channels show.
//
// Labels match whole codes, so figures are converted to one of these: no unit of 10 ms or of 512
// bytes has a label.
#pragma once

#include <cstdint>

namespace tavrel::units {

using Unit = std::uint64_t;

/// Quantity (8 bits), scale (power of two, power of ten: 8 bits each, biased by 127).
constexpr Unit unitCode(std::uint64_t quantity, std::uint64_t scale) {
  return quantity << 56 | scale << 32;
}

inline constexpr Unit kPlain = 0;  // no unit: percentages, states, hours, revolutions per minute
inline constexpr Unit kSeconds = unitCode(1, 0);
inline constexpr Unit kMilliseconds = unitCode(1, 0x7C);
inline constexpr Unit kMicroseconds = unitCode(1, 0x79);
inline constexpr Unit kNanoseconds = unitCode(1, 0x76);
inline constexpr Unit kMicrowatts = unitCode(2, 0x79);
inline constexpr Unit kMicrojoules = unitCode(3, 0x79);
inline constexpr Unit kMilliamperes = unitCode(4, 0x7C);
inline constexpr Unit kMicroamperes = unitCode(4, 0x79);
inline constexpr Unit kMillivolts = unitCode(5, 0x7C);
inline constexpr Unit kMicrovolts = unitCode(5, 0x79);
inline constexpr Unit kBytes = unitCode(9, 0x8200);
inline constexpr Unit kKibibytes = unitCode(9, 0x8C00);
inline constexpr Unit kPages = kKibibytes | 4;  // of 4 KiB
inline constexpr Unit kMillidegrees = unitCode(10, 0x7C);
inline constexpr Unit kEvents = unitCode(100, 0);
inline constexpr Unit kPackets = unitCode(101, 0);

}  // namespace tavrel::units
