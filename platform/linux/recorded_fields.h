// Fields of recordings.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

#include "base/kernel_return.h"
#include "base/plist.h"

namespace tavrel {

/// An integer of 64 bits, signed or not; nothing for anything else.
inline std::optional<std::uint64_t> wordOf(const plist::Value& value) {
  const auto number = value.number();
  if (!number || number->isFloating()) return std::nullopt;
  return static_cast<std::uint64_t>(number->int64());
}

/// An integer of 32 bits, signed or not; one that has more reads as the largest.
inline std::optional<std::uint32_t> halfWordOf(const plist::Value& value) {
  const auto word = wordOf(value);
  if (!word) return std::nullopt;
  const auto low = static_cast<std::uint32_t>(*word);
  const auto asSigned = static_cast<std::int64_t>(static_cast<std::int32_t>(low));
  return *word == low || *word == static_cast<std::uint64_t>(asSigned) ? low : UINT32_MAX;
}

/// The return code that a recording gives under `key`; 0 when it gives none.
inline KernelReturn returnCodeOf(const plist::Dictionary& record, std::string_view key) {
  return halfWordOf(record.get(key)).value_or(kKernelSuccess);
}

}  // namespace tavrel
