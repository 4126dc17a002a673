#include <algorithm>
#include <bit>
#include <cstddef>
#include <cstdint>
#include <limits>
#include <string>
#include <string_view>
#include <vector>

#include "base/format.h"
#include "base/limits.h"
#include "platform/plist/binary.h"
#include "platform/plist/binary_layout.h"
#include "platform/plist/utf16.h"

namespace tavrel::plist {
namespace {

using namespace binary;

// Each value is one object, and may have one more as its key.
constexpr std::size_t kLargestObjectCount = 2 * limits::kPropertyListValues;

// A big-endian word of 1 to 8 bytes; the caller has checked that they exist.
std::uint64_t loadWord(const std::byte* at, std::size_t width) {
  std::uint64_t word = 0;
  for (std::size_t i = 0; i < width; ++i)
    word = word << 8 | std::to_integer<std::uint64_t>(at[i]);
  return word;
}

bool isAscii(std::string_view text) {
  return std::ranges::none_of(text, [](char byte) { return (byte & 0x80) != 0; });
}

// Operations return false on failure, and set `error_`.
class BinaryReader {
 public:
  explicit BinaryReader(ByteSpan bytes) : bytes_(bytes) {}

  Expected<Value> read() {
    Value root;
    if (!readTrailer() || !readValue(root_, root)) return Error{std::move(error_)};
    return root;
  }

 private:
  struct Reference {
    std::uint64_t number;  // of the object
    std::size_t at;        // where the reference is
  };
  // An object whose marker has been read.
  struct Object {
    std::uint8_t marker = 0;
    std::size_t offset = 0;   // of the marker
    std::size_t content = 0;  // offset of what follows
    std::size_t length = 0;   // elements, for the types that have a length
  };

  bool fail(std::size_t offset, std::string_view reason) {
    error_ = format("binary property list, offset %zu: %s", offset, reason);
    return false;
  }

  bool readTrailer();
  bool open(const Reference& reference, Object& object);
  bool readLength(Object& object);
  bool readValue(const Reference& reference, Value& out);
  bool readInteger(const Object& object, Value& out);
  bool readReal(const Object& object, Value& out);
  bool readData(Object& object, Value& out);
  bool readText(const Reference& reference, Object& object, String& out);
  bool readKey(const Reference& reference, String& out);
  bool readArray(const Reference& reference, Object& object, Value& out);
  bool readDictionary(const Reference& reference, Object& object, Value& out);

  // True when `count` elements of `width` bytes follow the object's marker and length.
  bool holds(const Object& object, std::size_t count, std::size_t width) {
    if (count <= (objectsEnd_ - object.content) / width) return true;
    return fail(object.offset, "the object does not end before the table of offsets");
  }
  bool admitBytes(std::size_t offset, std::size_t count);
  bool enter(const Reference& reference, Object& object, std::size_t referencesPerElement);
  Reference referenceAt(const Object& object, std::size_t index) const {
    const std::size_t at = object.content + index * referenceWidth_;
    return {loadWord(bytes_.data() + at, referenceWidth_), at};
  }

  ByteSpan bytes_;
  std::string error_;

  std::size_t offsetWidth_ = 0;
  std::size_t referenceWidth_ = 0;
  std::size_t objectCount_ = 0;
  Reference root_{};
  std::size_t objectsEnd_ = 0;  // the table of offsets begins here

  std::vector<String> texts_;        // by object number; a text is shared by all that refer to it
  std::vector<std::uint64_t> open_;  // the containers around the value being read
  std::size_t values_ = 1;
  std::size_t contentBytes_ = 0;  // of texts and data
};

bool BinaryReader::readTrailer() {
  if (bytes_.size() > limits::kPropertyListBytes) {
    error_ = format("binary property list: it has %zu bytes; the limit is %zu", bytes_.size(),
                    limits::kPropertyListBytes);
    return false;
  }
  if (!asText(bytes_).starts_with(kHeader)) return fail(0, "it does not begin with \"bplist00\"");
  if (bytes_.size() < kHeader.size() + kTrailerBytes) {
    return fail(bytes_.size(), "it ends before its trailer of 32 bytes");
  }
  const std::size_t trailer = bytes_.size() - kTrailerBytes;
  const std::byte* const at = bytes_.data() + trailer;
  offsetWidth_ = std::to_integer<std::size_t>(at[kOffsetWidthAt]);
  referenceWidth_ = std::to_integer<std::size_t>(at[kReferenceWidthAt]);
  const std::uint64_t objectCount = loadWord(at + kObjectCountAt, 8);
  const std::uint64_t tableOffset = loadWord(at + kTableOffsetAt, 8);
  root_ = {loadWord(at + kRootAt, 8), trailer + kRootAt};

  for (const std::size_t field : {kOffsetWidthAt, kReferenceWidthAt}) {
    const auto width = std::to_integer<unsigned>(at[field]);
    if (width < 1 || width > 8) {
      return fail(trailer + field, format("%u is not a width from 1 to 8 bytes", width));
    }
  }
  if (tableOffset < kHeader.size() || tableOffset > trailer) {
    return fail(trailer + kTableOffsetAt,
                format("the table of offsets begins at %llu, outside the document", tableOffset));
  }
  if (objectCount > (trailer - tableOffset) / offsetWidth_) {
    return fail(trailer + kObjectCountAt,
                format("the table of offsets has no room for %llu objects", objectCount));
  }
  if (objectCount > kLargestObjectCount) {
    return fail(trailer + kObjectCountAt,
                format("there are more than %zu objects", kLargestObjectCount));
  }
  objectCount_ = static_cast<std::size_t>(objectCount);
  objectsEnd_ = static_cast<std::size_t>(tableOffset);
  texts_.resize(objectCount_);
  return true;
}

// Reads the marker of an object.
bool BinaryReader::open(const Reference& reference, Object& object) {
  if (reference.number >= objectCount_) {
    return fail(reference.at, format("a reference to object %llu, where there are %zu",
                                     reference.number, objectCount_));
  }
  const std::size_t entry = objectsEnd_ + static_cast<std::size_t>(reference.number) * offsetWidth_;
  const std::uint64_t offset = loadWord(bytes_.data() + entry, offsetWidth_);
  if (offset < kHeader.size() || offset >= objectsEnd_) {
    return fail(entry, format("object %llu is at offset %llu, outside the objects",
                              reference.number, offset));
  }
  object.offset = static_cast<std::size_t>(offset);
  object.content = object.offset + 1;
  object.marker = std::to_integer<std::uint8_t>(bytes_[object.offset]);
  return true;
}

bool BinaryReader::readLength(Object& object) {
  object.length = object.marker & kLengthMask;
  if (object.length != kLengthFollows) return true;
  if (!holds(object, 1, 1)) return false;
  const auto marker = std::to_integer<std::uint8_t>(bytes_[object.content]);
  const unsigned exponent = marker & kLengthMask;
  if ((marker & kTypeMask) != kInteger || exponent > 3) {
    return fail(object.content, "the length of an object is not an integer of 1 to 8 bytes");
  }
  const std::size_t width = std::size_t{1} << exponent;
  ++object.content;
  if (!holds(object, 1, width)) return false;
  const std::uint64_t length = loadWord(bytes_.data() + object.content, width);
  object.content += width;
  // Every element has at least one byte.
  if (length > objectsEnd_ - object.content) {
    return fail(object.offset, "the object does not end before the table of offsets");
  }
  object.length = static_cast<std::size_t>(length);
  return true;
}

bool BinaryReader::readValue(const Reference& reference, Value& out) {
  Object object;
  if (!open(reference, object)) return false;
  switch (object.marker & kTypeMask) {
    case kInteger:
      return readInteger(object, out);
    case kReal:
      return readReal(object, out);
    case kDate& kTypeMask:
      if (object.marker != kDate) break;
      if (!holds(object, 1, 8)) return false;
      out = Date::sinceEpoch(std::bit_cast<double>(loadWord(bytes_.data() + object.content, 8)));
      return true;
    case kData:
      return readData(object, out);
    case kAscii:
    case kUtf16: {
      String text;
      if (!readText(reference, object, text)) return false;
      out = text;
      return true;
    }
    case kArray:
      return readArray(reference, object, out);
    case kDictionary:
      return readDictionary(reference, object, out);
    default:
      if (object.marker != kFalse && object.marker != kTrue) break;
      out = object.marker == kTrue;
      return true;
  }
  return fail(object.offset, format("marker 0x%02x is of an unknown type", object.marker));
}

bool BinaryReader::readInteger(const Object& object, Value& out) {
  const unsigned exponent = object.marker & kLengthMask;
  if (exponent > 4) return fail(object.offset, "an integer of more than 16 bytes");
  const std::size_t width = std::size_t{1} << exponent;
  if (!holds(object, 1, width)) return false;
  const std::byte* at = bytes_.data() + object.content;
  if (width < 16) {
    out = static_cast<std::int64_t>(loadWord(at, width));
    return true;
  }
  const std::uint64_t high = loadWord(at, 8);
  const std::uint64_t low = loadWord(at + 8, 8);
  const bool lowIsNegative = (low >> 63) != 0;
  if (high == 0 && lowIsNegative) {
    out = low;
  } else if (high == (lowIsNegative ? std::numeric_limits<std::uint64_t>::max() : 0)) {
    out = static_cast<std::int64_t>(low);
  } else {
    return fail(object.offset, "an integer beyond 64 bits");
  }
  return true;
}

bool BinaryReader::readReal(const Object& object, Value& out) {
  const unsigned exponent = object.marker & kLengthMask;
  if (exponent != 2 && exponent != 3) return fail(object.offset, "a real of neither 4 nor 8 bytes");
  const std::size_t width = std::size_t{1} << exponent;
  if (!holds(object, 1, width)) return false;
  const std::uint64_t bits = loadWord(bytes_.data() + object.content, width);
  if (width == 4) {
    out = std::bit_cast<float>(static_cast<std::uint32_t>(bits));
  } else {
    out = std::bit_cast<double>(bits);
  }
  return true;
}

// Data can be modified in place, so each reference gets a copy, and objects may overlap: without a
// limit, a small document could demand any amount of memory. Texts are shared, but printing or
// encoding the value writes each reference in full.
bool BinaryReader::admitBytes(std::size_t offset, std::size_t count) {
  contentBytes_ += count;
  if (contentBytes_ <= limits::kPropertyListBytes) return true;
  return fail(
      offset,
      format("texts and data, after shared references are expanded, are more than %zu bytes",
             limits::kPropertyListBytes));
}

bool BinaryReader::readData(Object& object, Value& out) {
  if (!readLength(object) || !holds(object, object.length, 1)) return false;
  if (!admitBytes(object.offset, object.length)) return false;
  out = Data(bytes_.subspan(object.content, object.length));
  return true;
}

bool BinaryReader::readText(const Reference& reference, Object& object, String& out) {
  String& known = texts_[static_cast<std::size_t>(reference.number)];
  if (known.view().empty()) {
    const std::size_t width = (object.marker & kTypeMask) == kAscii ? 1 : 2;
    if (!readLength(object) || !holds(object, object.length, width)) return false;
    const ByteSpan bytes = bytes_.subspan(object.content, object.length * width);
    if (width == 2) {
      known = utf8FromUtf16(bytes);
    } else if (isAscii(asText(bytes))) {
      known = asText(bytes);
    } else {
      return fail(object.offset, "a byte of a text is not ASCII");
    }
  }
  out = known;
  return admitBytes(object.offset, out.view().size());
}

bool BinaryReader::readKey(const Reference& reference, String& out) {
  if (reference.number < objectCount_) {
    out = texts_[static_cast<std::size_t>(reference.number)];
    if (!out.view().empty()) return admitBytes(reference.at, out.view().size());
  }
  Object object;
  if (!open(reference, object)) return false;
  const unsigned type = object.marker & kTypeMask;
  if (type != kAscii && type != kUtf16) return fail(object.offset, "a key is not a string");
  return readText(reference, object, out);
}

// Opens a container whose references have been checked.
bool BinaryReader::enter(const Reference& reference, Object& object,
                         std::size_t referencesPerElement) {
  if (!readLength(object)) return false;
  if (!holds(object, object.length, referenceWidth_ * referencesPerElement)) return false;
  if (std::ranges::find(open_, reference.number) != open_.end()) {
    return fail(object.offset, "a container contains itself");
  }
  if (open_.size() == limits::kPropertyListDepth) {
    return fail(object.offset,
                format("containers nest deeper than %zu", limits::kPropertyListDepth));
  }
  values_ += object.length;
  if (values_ > limits::kPropertyListValues) {
    return fail(object.offset, format("there are more than %zu values, after shared references are "
                                      "expanded",
                                      limits::kPropertyListValues));
  }
  open_.push_back(reference.number);
  return true;
}

bool BinaryReader::readArray(const Reference& reference, Object& object, Value& out) {
  if (!enter(reference, object, 1)) return false;
  Array array = Array::create(object.length);
  for (std::size_t i = 0; i < object.length; ++i) {
    Value element;
    if (!readValue(referenceAt(object, i), element)) return false;
    array.append(std::move(element));
  }
  open_.pop_back();
  out = array;
  return true;
}

bool BinaryReader::readDictionary(const Reference& reference, Object& object, Value& out) {
  if (!enter(reference, object, 2)) return false;
  Dictionary dictionary = Dictionary::create(object.length);
  for (std::size_t i = 0; i < object.length; ++i) {
    String key;
    Value value;
    if (!readKey(referenceAt(object, i), key)) return false;
    if (!readValue(referenceAt(object, object.length + i), value)) return false;
    dictionary.set(key, std::move(value));
  }
  open_.pop_back();
  out = dictionary;
  return true;
}

}  // namespace

Expected<Value> readBinary(ByteSpan bytes) {
  return BinaryReader(bytes).read();
}

}  // namespace tavrel::plist
