#include "base/keyed_hash.h"

#include <bit>
#include <random>

#include "base/bytes.h"

namespace tavrel {
namespace {

std::uint64_t randomWord(std::random_device& source) {
  return std::uint64_t{source()} << 32 | source();
}

const HashKey& processKey() {
  static const HashKey key = [] {
    std::random_device source;
    return HashKey{randomWord(source), randomWord(source)};
  }();
  return key;
}

struct SipState {
  std::uint64_t v0, v1, v2, v3;

  void round() {
    v0 += v1;
    v1 = std::rotl(v1, 13) ^ v0;
    v0 = std::rotl(v0, 32);
    v2 += v3;
    v3 = std::rotl(v3, 16) ^ v2;
    v0 += v3;
    v3 = std::rotl(v3, 21) ^ v0;
    v2 += v1;
    v1 = std::rotl(v1, 17) ^ v2;
    v2 = std::rotl(v2, 32);
  }

  void absorb(std::uint64_t word) {
    v3 ^= word;
    round();
    v0 ^= word;
  }
};

// Little-endian on every machine: the length of the text goes into the last word's highest byte.
std::uint64_t lastWord(std::string_view rest) {
  std::uint64_t word = 0;
  for (std::size_t i = 0; i < rest.size(); ++i)
    word |= std::uint64_t{static_cast<unsigned char>(rest[i])} << (8 * i);
  return word;
}

}  // namespace

std::uint64_t sipHash(std::string_view text, const HashKey& key) {
  SipState state{0x736F6D6570736575 ^ key.low, 0x646F72616E646F6D ^ key.high,
                 0x6C7967656E657261 ^ key.low, 0x7465646279746573 ^ key.high};
  std::size_t at = 0;
  for (; text.size() - at >= 8; at += 8)
    state.absorb(*loadLittle64(asBytes(text), at));
  state.absorb(std::uint64_t{text.size()} << 56 | lastWord(text.substr(at)));
  state.v2 ^= 0xFF;
  for (int i = 0; i < 3; ++i)
    state.round();
  return state.v0 ^ state.v1 ^ state.v2 ^ state.v3;
}

std::uint64_t keyedHash(std::string_view text) {
  return sipHash(text, processKey());
}

}  // namespace tavrel
