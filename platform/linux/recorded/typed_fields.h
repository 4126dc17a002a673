// Typed access to the fields of recordings.
#pragma once

#include <cstdint>
#include <optional>
#include <span>
#include <string>
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

/// An integer of 32 bits, signed or not; a wider one reads as the largest.
inline std::optional<std::uint32_t> halfWordOf(const plist::Value& value) {
  const auto word = wordOf(value);
  if (!word) return std::nullopt;
  const auto low = static_cast<std::uint32_t>(*word);
  const auto asSigned = static_cast<std::int64_t>(static_cast<std::int32_t>(low));
  return *word == low || *word == static_cast<std::uint64_t>(asSigned) ? low : UINT32_MAX;
}

/// A field and its required type, if it is present.
struct RecordedField {
  enum class Form : std::uint8_t { Integer, Integers, String, Data, Array, Dictionary };

  std::string_view key;
  Form form;
};

/// The required type in words when the entry's value has another; null otherwise.
const char* missedForm(std::span<const RecordedField> fields, const plist::Entry& entry);

/// What is wrong with the fields of a record, as the end of a message; empty when nothing is.
std::string faultOf(std::span<const RecordedField> fields, const plist::Dictionary& record);

/// The return code that a recording gives under `key`; 0 without one.
inline KernelReturn returnCodeOf(const plist::Dictionary& record, std::string_view key) {
  return halfWordOf(record.get(key)).value_or(kKernelSuccess);
}

}  // namespace tavrel
