#include "platform/linux/sqlite_chunk.h"

#include <bit>
#include <cstring>

namespace tavrel {
namespace {

template <class Word>
void appendLittle(std::string& out, Word word) {
  for (std::size_t i = 0; i < sizeof(Word); ++i) {
    out += static_cast<char>(static_cast<unsigned char>(word >> (8 * i)));
  }
}

template <class Word>
Word takeLittle(const char* at) {
  Word word = 0;
  if constexpr (std::endian::native == std::endian::little) {
    std::memcpy(&word, at, sizeof word);
  } else {
    for (std::size_t i = sizeof word; i-- > 0;) {
      word = static_cast<Word>(word << 8 | static_cast<unsigned char>(at[i]));
    }
  }
  return word;
}

}  // namespace

void appendChunkRecord(std::string& chunk, const BHHistoryDistributionEnumerator::Sample& sample) {
  appendLittle(chunk, std::bit_cast<std::uint64_t>(sample.value));
  appendLittle(chunk, sample.secondsInDayOffset);
}

bool decodeChunk(std::string_view chunk,
                 std::vector<BHHistoryDistributionEnumerator::Sample>& samples) {
  const std::size_t count = chunk.size() / kChunkRecordBytes;
  if (chunk.size() % kChunkRecordBytes != 0 || count == 0 || count > kValuesPerChunk) return false;
  samples.resize(count);
  const char* record = chunk.data();
  for (auto& sample : samples) {
    sample.value = std::bit_cast<double>(takeLittle<std::uint64_t>(record));
    sample.secondsInDayOffset = takeLittle<std::uint32_t>(record + 8);
    record += kChunkRecordBytes;
  }
  return true;
}

}  // namespace tavrel
