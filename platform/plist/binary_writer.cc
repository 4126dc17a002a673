#include <algorithm>
#include <array>
#include <bit>
#include <cmath>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <string>
#include <string_view>
#include <utility>
#include <vector>

#include "base/keyed_hash.h"
#include "base/limits.h"
#include "platform/plist/binary.h"
#include "platform/plist/binary_layout.h"
#include "platform/plist/encoding_walk.h"
#include "platform/plist/utf16.h"

namespace tavrel::plist {
namespace {

using namespace binary;

// The smallest sufficient width of 1, 2, 4 and 8 bytes.
std::size_t widthOf(std::uint64_t word) {
  if (word <= 0xFF) return 1;
  if (word <= 0xFFFF) return 2;
  return word <= 0xFFFFFFFF ? 4 : 8;
}

void appendWord(std::string& out, std::uint64_t word, std::size_t width) {
  for (std::size_t i = width; i-- > 0;)
    out += static_cast<char>(word >> (8 * i) & 0xFF);
}

void appendMarker(std::string& out, unsigned type, std::size_t length) {
  if (length < kLengthFollows) {
    out += static_cast<char>(type | length);
    return;
  }
  const std::size_t width = widthOf(length);
  out += static_cast<char>(type | kLengthFollows);
  out += static_cast<char>(kInteger | std::countr_zero(width));
  appendWord(out, length, width);
}

// The bits of a scalar that is not text, and the marker with which they are written.
struct Word {
  std::uint64_t bits;
  std::uint8_t marker;
  std::uint8_t width;  // bytes
  bool operator==(const Word&) const = default;
};

constexpr std::uint8_t kWidestInteger = 16;

Word wordOfReal(double real, bool isFloat) {
  if (std::isnan(real)) real = std::numeric_limits<double>::quiet_NaN();  // one bit pattern for all
  if (!isFloat) return {std::bit_cast<std::uint64_t>(real), kReal | 3, 8};
  return {std::bit_cast<std::uint32_t>(static_cast<float>(real)), kReal | 2, 4};
}

Word wordOf(const Number& number) {
  if (number.isFloating()) return wordOfReal(number.real(), number.kind() == NumberKind::Float);
  const auto bits = static_cast<std::uint64_t>(number.int64());
  if (number.kind() == NumberKind::UInt64 && number.int64() < 0) {
    return {bits, kInteger | 4, kWidestInteger};
  }
  const std::size_t width = widthOf(bits);
  return {bits, static_cast<std::uint8_t>(kInteger | std::countr_zero(width)),
          static_cast<std::uint8_t>(width)};
}

// Numbers the objects in the order of a walk over the values. Once the width of references is
// known, writes the objects in that order.
class BinaryWriter {
 public:
  Expected<std::string> write(const Value& root) {
    if (!number(root, 0)) return guard_.error();
    out_ = kHeader;
    const std::size_t referenceWidth = widthOf(objects_.size() - 1);
    std::vector<std::size_t> offsets;
    offsets.reserve(objects_.size());
    for (const Object& object : objects_) {
      offsets.push_back(out_.size());
      append(object, referenceWidth);
      if (!guard_.admitBytes(out_.size())) return guard_.error();
    }
    appendTable(offsets, referenceWidth);
    if (!guard_.admitBytes(out_.size())) return guard_.error();
    return std::move(out_);
  }

 private:
  // One object; `type` is its marker without the length. Borrows from the values.
  struct Object {
    std::uint64_t hash = 0;  // of numbers, dates, booleans and texts
    std::uint8_t type = 0;
    Word word{};                     // numbers, dates, booleans
    std::string_view text{};         // texts, and the bytes of data
    std::size_t firstReference = 0;  // containers: in `references_`
    std::size_t count = 0;           // containers: references; a dictionary has two per entry
  };

  static bool isAlike(const Object& a, const Object& b) {
    return a.hash == b.hash && a.type == b.type && a.word == b.word && a.text == b.text;
  }

  bool number(const Value& value, std::size_t depth);
  bool numberContainer(const Value& value, std::size_t depth);
  void numberWord(const Word& word);
  bool numberText(std::string_view text);
  void addUnique(const Object& object);
  std::uint32_t& slotFor(const Object& object);
  void growSlots();
  std::size_t add(const Object& object) {
    objects_.push_back(object);
    return last_ = objects_.size() - 1;
  }
  void append(const Object& object, std::size_t referenceWidth);
  void appendTable(const std::vector<std::size_t>& offsets, std::size_t referenceWidth);

  EncodingGuard guard_{limits::kPropertyListValues};
  SortedEntries entries_{Alphabet::Unicode};
  std::vector<Object> objects_;
  std::vector<std::size_t> references_;
  std::vector<std::uint32_t> slots_;  // object number + 1, 0 for a free slot; a power of two
  std::size_t uniqueObjects_ = 0;
  std::size_t contentBytes_ = 0;  // of texts and data, counted once per occurrence, as readers do
  std::size_t last_ = 0;          // the object numbered or found last
  std::string out_;
};

bool BinaryWriter::number(const Value& value, std::size_t depth) {
  if (!guard_.admit(value, depth)) return false;
  switch (value.kind()) {
    case Kind::Null:
      break;  // not admitted
    case Kind::Boolean:
      numberWord({0, *value.boolean() ? kTrue : kFalse, 0});
      break;
    case Kind::Number:
      numberWord(wordOf(*value.number()));
      break;
    case Kind::Date: {
      Word word = wordOfReal(value.date()->secondsSinceEpoch(), false);
      word.marker = kDate;
      numberWord(word);
      break;
    }
    case Kind::String:
      return numberText(*value.string());
    case Kind::Data:
      add({.type = kData, .text = asText(value.data().bytes())});
      contentBytes_ += value.data().size();
      return guard_.admitBytes(contentBytes_);
    case Kind::Array:
    case Kind::Dictionary:
      return numberContainer(value, depth);
  }
  return true;
}

bool BinaryWriter::numberContainer(const Value& value, std::size_t depth) {
  const bool isArray = value.kind() == Kind::Array;
  const std::size_t count = isArray ? value.array().size() : 2 * value.dictionary().size();
  const std::size_t first = references_.size();
  const std::size_t self =
      add({.type = isArray ? kArray : kDictionary, .firstReference = first, .count = count});
  references_.resize(first + count);
  if (isArray) {
    std::size_t index = 0;
    for (const Value& element : value.array()) {
      if (!number(element, depth + 1)) return guard_.under(index);
      references_[first + index++] = last_;
    }
  } else {
    const std::size_t firstEntry = entries_.push(value.dictionary());
    for (std::size_t i = 0; i < count / 2; ++i) {
      const SortedEntries::Item item = entries_[firstEntry + i];
      if (!numberText(item.key)) return false;
      references_[first + i] = last_;
      if (!number(*item.value, depth + 1)) return guard_.under(item.key);
      references_[first + count / 2 + i] = last_;
    }
    entries_.popTo(firstEntry);
  }
  last_ = self;
  return true;
}

void BinaryWriter::numberWord(const Word& word) {
  const auto bytes = std::bit_cast<std::array<char, sizeof word.bits>>(word.bits);
  const std::uint64_t hash = keyedHash({bytes.data(), bytes.size()}) ^ word.marker;
  addUnique({.hash = hash, .type = word.marker, .word = word});
}

bool BinaryWriter::numberText(std::string_view text) {
  addUnique({.hash = keyedHash(text), .type = kAscii, .text = text});
  contentBytes_ += text.size();
  return guard_.admitBytes(contentBytes_);
}

// Adds the object unless there is an equal one.
void BinaryWriter::addUnique(const Object& object) {
  if (uniqueObjects_ * 2 >= slots_.size()) growSlots();
  std::uint32_t& slot = slotFor(object);
  if (slot == 0) {
    add(object);
    ++uniqueObjects_;
    slot = static_cast<std::uint32_t>(objects_.size());
  }
  last_ = slot - 1;
}

// The slot of an equal object, or the free slot where this one belongs.
std::uint32_t& BinaryWriter::slotFor(const Object& object) {
  const std::size_t mask = slots_.size() - 1;
  auto at = static_cast<std::size_t>(object.hash) & mask;
  while (slots_[at] != 0 && !isAlike(objects_[slots_[at] - 1], object))
    at = (at + 1) & mask;
  return slots_[at];
}

void BinaryWriter::growSlots() {
  const std::vector<std::uint32_t> old = std::exchange(slots_, {});
  slots_.resize(std::max<std::size_t>(64, old.size() * 4));
  for (const std::uint32_t slot : old) {
    if (slot != 0) slotFor(objects_[slot - 1]) = slot;
  }
}

void BinaryWriter::append(const Object& object, std::size_t referenceWidth) {
  switch (object.type) {
    case kData:
      appendMarker(out_, kData, object.text.size());
      out_ += object.text;
      return;
    case kAscii:
      if (std::ranges::all_of(object.text, [](char byte) { return (byte & 0x80) == 0; })) {
        appendMarker(out_, kAscii, object.text.size());
        out_ += object.text;
      } else {
        const std::string words = utf16FromUtf8(object.text);
        appendMarker(out_, kUtf16, words.size() / 2);
        out_ += words;
      }
      return;
    case kArray:
    case kDictionary:
      appendMarker(out_, object.type, object.type == kArray ? object.count : object.count / 2);
      for (std::size_t i = 0; i < object.count; ++i)
        appendWord(out_, references_[object.firstReference + i], referenceWidth);
      return;
    default:
      out_ += static_cast<char>(object.word.marker);
      if (object.word.width == kWidestInteger) appendWord(out_, 0, 8);
      appendWord(out_, object.word.bits, std::min<std::size_t>(object.word.width, 8));
  }
}

void BinaryWriter::appendTable(const std::vector<std::size_t>& offsets,
                               std::size_t referenceWidth) {
  const std::size_t tableOffset = out_.size();
  const std::size_t offsetWidth = widthOf(offsets.back());
  out_.reserve(out_.size() + offsets.size() * offsetWidth + kTrailerBytes);
  for (const std::size_t offset : offsets)
    appendWord(out_, offset, offsetWidth);
  out_.append(kOffsetWidthAt, '\0');
  appendWord(out_, offsetWidth, 1);
  appendWord(out_, referenceWidth, 1);
  appendWord(out_, offsets.size(), 8);
  appendWord(out_, 0, 8);
  appendWord(out_, tableOffset, 8);
}

}  // namespace

Expected<std::string> writeBinary(const Value& value) {
  return BinaryWriter().write(value);
}

}  // namespace tavrel::plist
