// Hashing of text from outside.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>

namespace tavrel {

struct HashKey {
  std::uint64_t low, high;
};

/// SipHash-1-3.
std::uint64_t sipHash(std::string_view text, const HashKey& key);

/// Uses a random key per process, so that the author of the texts cannot make them collide. Values
/// differ from process to process and must not decide any order.
std::uint64_t keyedHash(std::string_view text);

/// The same for hash tables.
struct KeyedHash {
  using is_transparent = void;
  std::size_t operator()(std::string_view text) const {
    return static_cast<std::size_t>(keyedHash(text));
  }
};

}  // namespace tavrel
