// A mutator for targets that read property lists. Bytes that change at random seldom leave
// a valid document, so it changes one value of the document instead, or repairs the trailer
// of a binary one afterwards.
//
//   extern "C" std::size_t LLVMFuzzerCustomMutator(...) { return mutatePropertyList(...); }
#pragma once

#include <algorithm>
#include <array>
#include <cstdint>
#include <random>
#include <string>

#include "platform/plist/binary.h"
#include "platform/plist/xml.h"

extern "C" std::size_t LLVMFuzzerMutate(std::uint8_t* data, std::size_t size, std::size_t most);

namespace tavrel::fuzz {

/// Changes one randomly chosen value of a document.
class ValueMutator {
 public:
  explicit ValueMutator(unsigned seed) : chance_(seed) {}

  plist::Value changed(const plist::Value& root) {
    left_ = chance_() % countIn(root);
    return copyOf(root);
  }

 private:
  static std::size_t countIn(const plist::Value& value) {
    std::size_t count = 1;
    for (const plist::Entry& entry : value.dictionary())
      count += countIn(entry.value);
    for (const plist::Value& element : value.array())
      count += countIn(element);
    return count;
  }

  plist::Value copyOf(const plist::Value& value) {
    if (left_-- == 0) return another(value);
    if (const plist::Dictionary dictionary = value.dictionary()) {
      plist::Dictionary made = plist::Dictionary::create();
      for (const plist::Entry& entry : dictionary)
        made.set(entry.key, copyOf(entry.value));
      return made;
    }
    if (const plist::Array array = value.array()) {
      plist::Array made = plist::Array::create();
      for (const plist::Value& element : array)
        made.append(copyOf(element));
      return made;
    }
    return value;
  }

  std::string text(std::string_view text) {
    std::array<std::uint8_t, 256> bytes{};
    const std::size_t size = std::min(text.size(), bytes.size() / 2);
    std::copy_n(text.begin(), size, bytes.begin());
    const std::size_t changed = LLVMFuzzerMutate(bytes.data(), size, bytes.size());
    return {bytes.begin(), bytes.begin() + static_cast<std::ptrdiff_t>(changed)};
  }

  plist::Number number(std::int64_t value) {
    constexpr std::int64_t kLimits[] = {0, 1, -1, INT32_MAX, INT32_MIN, INT64_MAX, INT64_MIN};
    switch (chance_() % 4) {
      case 0:
        return kLimits[chance_() % std::size(kLimits)];
      case 1:
        return static_cast<double>(value) + 0.5;
      default:
        return wrappingAdd(value, static_cast<std::int64_t>(chance_() % 17) - 8);
    }
  }

  // Returns another value, sometimes of another type; null, which removes the value, is among them.
  plist::Value another(const plist::Value& value) {
    switch (chance_() % 12) {
      case 0:
        return {};
      case 1:
        return plist::Array{value, value};
      case 2:
        return plist::Dictionary{{text("a"), value}};
      case 3:
        return number(0);
      case 4:
        return text("");
      case 5:
        return plist::Data(asBytes(text("data")));
      case 6:
        return plist::Date::ofDay(static_cast<std::int64_t>(chance_() % 40'000));
      case 7:
        return chance_() % 2 == 0;
      default:
        return sameKind(value);
    }
  }

  plist::Value sameKind(const plist::Value& value) {
    if (const auto old = value.string()) return text(*old);
    if (const auto old = value.number()) return number(old->int64());
    if (const auto old = value.boolean()) return !*old;
    if (const auto old = value.data()) return plist::Data(asBytes(text(asText(old.bytes()))));
    if (const auto old = value.array()) {
      plist::Array made = plist::Array::create();
      for (const plist::Value& element : old) {
        if (chance_() % 4 != 0) made.append(element);
        if (chance_() % 4 == 0) made.append(another(element));
      }
      return made;
    }
    plist::Dictionary made = plist::Dictionary::create();
    for (const plist::Entry& entry : value.dictionary()) {
      if (chance_() % 4 != 0) made.set(entry.key, entry.value);
      if (chance_() % 4 == 0) made.set(text(entry.key), entry.value);
    }
    return made;
  }

  std::minstd_rand chance_;
  std::size_t left_ = 0;
};

/// Points the trailer to the table of offsets, whose position follows from the document's length.
inline void mendTrailer(std::uint8_t* data, std::size_t size) {
  constexpr std::size_t kHead = 8, kTrailer = 32;
  if (size < kHead + kTrailer || !std::equal(data, data + kHead, "bplist00")) return;
  std::uint8_t* const trailer = data + size - kTrailer;
  const std::size_t offsetBytes = std::clamp<std::size_t>(trailer[6], 1, 8);
  const std::size_t objects = std::min<std::size_t>(trailer[15], 255);
  const std::size_t table = offsetBytes * objects;
  if (table > size - kTrailer - kHead) return;
  const std::size_t at = size - kTrailer - table;
  for (std::size_t i = 0; i < 8; ++i)
    trailer[24 + i] = static_cast<std::uint8_t>(std::uint64_t{at} >> (8 * (7 - i)));
}

inline std::size_t mutatePropertyList(std::uint8_t* data, std::size_t size, std::size_t most,
                                      unsigned seed) {
  const ByteSpan bytes = std::as_bytes(std::span(data, size));
  const bool isBinary = asText(bytes).starts_with("bplist00");
  if (seed % 4 == 0) {
    if (const auto value = isBinary ? plist::readBinary(bytes) : plist::readXml(bytes)) {
      const plist::Value changed = ValueMutator(seed).changed(*value);
      const auto document = isBinary ? plist::writeBinary(changed) : plist::writeXml(changed);
      if (document && document->size() <= most) {
        std::ranges::copy(*document, data);
        return document->size();
      }
    }
  }
  size = LLVMFuzzerMutate(data, size, most);
  if (seed % 4 == 1) mendTrailer(data, size);
  return size;
}

}  // namespace tavrel::fuzz
