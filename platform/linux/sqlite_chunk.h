// The packed form in which the values of a distribution are kept.
//
// A chunk is a run of records of 12 bytes, in the order of recording: the double's 64 bits, then
// the offset in seconds within the day, both little-endian. Records stand side by side, and not in
// two columns, so that appending leaves the bytes before as they are. Every chunk of a series but
// the last is full.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "platform/statistics_store.h"

namespace tavrel {

/// 12 KiB: few enough bytes that one more value does not rewrite much, enough that a million
/// values are read in a thousand steps.
inline constexpr std::size_t kValuesPerChunk = 1024;
inline constexpr std::size_t kChunkRecordBytes = 12;

void appendChunkRecord(std::string& chunk, const BHHistoryDistributionEnumerator::Sample& sample);

/// Replaces `samples` with the chunk's content. False when the bytes are no chunk.
bool decodeChunk(std::string_view chunk,
                 std::vector<BHHistoryDistributionEnumerator::Sample>& samples);

}  // namespace tavrel
