// Limits on the search for logs, with their units and reasons.
#pragma once

#include <cstddef>
#include <cstdint>

namespace tavrel::fleet::limits {

/// Nesting of folders.
inline constexpr std::size_t kFolderDepth = 64;

/// Bytes of the metadata of one log: a few short texts.
inline constexpr std::size_t kMetadataBytes = 1U << 20;

/// Bytes of memory for the metadata of an archive, which is kept until the archive's end: that of
/// some 400,000 logs.
inline constexpr std::size_t kKeptMetadataBytes = 128U << 20;

/// How many times its own size an archive may expand to, on top of a free allowance. Logs of many
/// devices have much in common, but not that much.
inline constexpr std::int64_t kArchiveRatio = 1'000;
inline constexpr std::int64_t kArchiveFreeBytes = 64 << 20;

}  // namespace tavrel::fleet::limits
