// Types of the structured records that the storage collection files.
#pragma once

#include <cstdint>

namespace tavrel {

inline constexpr std::uint32_t kEccRecordType = 172;
inline constexpr std::uint32_t kStorageRecordType = 176;  // telemetry and defects

}  // namespace tavrel
