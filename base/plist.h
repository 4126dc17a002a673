// Property-list values, the universal data model of the program.
//
// `Value` is null, a dictionary, array, string, number, boolean, data or date. It is 16 bytes and
// cheap to copy: a copy of a dictionary, an array or a data value refers to the same container, so
// a change through one copy shows in all. Copying the content is an explicit call, `mutableCopy`
// (one level) or `deepCopy`. Strings are immutable.
//
// `Dictionary`, `Array` and `Data` are typed handles on such a container. A handle may be empty. A
// look-up through an empty handle, or of a value that is absent or of another type, yields nothing,
// so look-ups can be chained:
//
//   if (const auto unit = channel.dictionary("Info").number("Unit")) use(unit->int64());
//
// Writing through an empty handle first creates a container for it. `Array{}` is an empty handle,
// and so a null value; an array without elements is `Array::create()`. Dictionaries enumerate in
// the order of insertion. Do not add or remove entries during an enumeration.
//
// Do not share any of this between threads.
#pragma once

#include <bit>
#include <concepts>
#include <cstddef>
#include <cstdint>
#include <initializer_list>
#include <iterator>
#include <optional>
#include <string>
#include <string_view>
#include <utility>

#include "base/arithmetic.h"
#include "base/bytes.h"

namespace tavrel::plist {

enum class Kind : std::uint8_t { Null, Boolean, Number, Date, String, Data, Array, Dictionary };

// -- Numbers ------------------------------------------------------------------------------------

enum class NumberKind : std::uint8_t { Int8, Int32, Int64, UInt64, Float, Double };

/// A number with its kind. Two numbers are equal when their values are, whatever their kinds.
/// Not-a-number equals itself, so that a value written can be compared with the value read back.
class Number {
 public:
  /// The kind is the narrowest that holds every value of the argument's type.
  template <std::integral Integer>
  requires(!std::same_as<Integer, bool>) constexpr Number(Integer value)
      : bits_(static_cast<std::uint64_t>(value)), kind_(kindOf<Integer>()) {}
  constexpr Number(float value)
      : bits_(std::bit_cast<std::uint64_t>(static_cast<double>(value))), kind_(NumberKind::Float) {}
  constexpr Number(double value)
      : bits_(std::bit_cast<std::uint64_t>(value)), kind_(NumberKind::Double) {}

  constexpr NumberKind kind() const { return kind_; }
  constexpr bool isFloating() const { return kind_ >= NumberKind::Float; }

  /// The value as a signed 64-bit integer: floats truncate and saturate (not-a-number gives 0),
  /// unsigned values keep their 64 bits.
  constexpr std::int64_t int64() const {
    return isFloating() ? saturatingInt64(std::bit_cast<double>(bits_))
                        : static_cast<std::int64_t>(bits_);
  }
  /// The low 32 bits of `int64`.
  constexpr std::int32_t int32() const { return static_cast<std::int32_t>(int64()); }
  constexpr std::uint32_t uint32() const { return static_cast<std::uint32_t>(int64()); }

  /// The nearest double.
  constexpr double real() const {
    if (isFloating()) return std::bit_cast<double>(bits_);
    if (kind_ == NumberKind::UInt64) return static_cast<double>(bits_);
    return static_cast<double>(static_cast<std::int64_t>(bits_));
  }

  friend bool operator==(const Number& a, const Number& b);

 private:
  friend class Value;
  constexpr Number(std::uint64_t bits, NumberKind kind) : bits_(bits), kind_(kind) {}

  template <class Integer>
  static constexpr NumberKind kindOf() {
    constexpr bool isSigned = std::signed_integral<Integer>;
    if (sizeof(Integer) == 1 && isSigned) return NumberKind::Int8;
    if (sizeof(Integer) < 4 || (sizeof(Integer) == 4 && isSigned)) return NumberKind::Int32;
    return sizeof(Integer) < 8 || isSigned ? NumberKind::Int64 : NumberKind::UInt64;
  }

  std::uint64_t bits_;  // an integer in two's complement, or the bits of a double
  NumberKind kind_;
};

// -- Dates --------------------------------------------------------------------------------------

/// An instant, in seconds since 2001-01-01 00:00:00 UTC, the epoch of the binary encoding.
class Date {
 public:
  /// The epoch in seconds since 1970-01-01 00:00:00 UTC.
  static constexpr double kEpoch = 978307200.0;

  static constexpr Date sinceEpoch(double seconds) { return Date(seconds); }
  static constexpr Date since1970(double seconds) { return Date(seconds - kEpoch); }
  static constexpr Date ofDay(std::int64_t daysSince1970) {
    return Date(static_cast<double>(daysSince1970) * 86400.0 - kEpoch);
  }

  constexpr double secondsSinceEpoch() const { return seconds_; }
  constexpr double secondsSince1970() const { return seconds_ + kEpoch; }

  /// Exact between dates that are whole seconds.
  friend constexpr double operator-(Date a, Date b) { return a.seconds_ - b.seconds_; }
  friend constexpr bool operator==(Date a, Date b) {
    return a.seconds_ == b.seconds_ || (a.seconds_ != a.seconds_ && b.seconds_ != b.seconds_);
  }

 private:
  explicit constexpr Date(double seconds) : seconds_(seconds) {}
  double seconds_;
};

// -- Sharing ------------------------------------------------------------------------------------

namespace detail {

struct StringRep;
struct DictionaryRep;
struct ArrayRep;
struct DataRep;

/// The common head of strings and containers. The reference count is not atomic.
struct Shared {
  explicit Shared(Kind kindOfRep) : kind(kindOfRep) {}
  std::uint32_t references = 0;
  Kind kind;
};

void destroy(Shared* object);

inline void retain(Shared* object) {
  if (object) ++object->references;
}
inline void release(Shared* object) {
  if (object && --object->references == 0) destroy(object);
}

/// A nullable handle that shares the ownership of a `Rep`, which derives from `Shared`.
template <class Rep>
class Ref {
 public:
  Ref() = default;
  explicit Ref(Shared* object) : object_(object) { retain(object_); }
  Ref(const Ref& other) : object_(other.object_) { retain(object_); }
  Ref(Ref&& other) noexcept : object_(std::exchange(other.object_, nullptr)) {}
  ~Ref() { release(object_); }
  Ref& operator=(Ref other) noexcept {
    std::swap(object_, other.object_);
    return *this;
  }

  explicit operator bool() const { return object_ != nullptr; }
  bool operator==(const Ref& other) const { return object_ == other.object_; }
  Shared* get() const { return object_; }
  Rep* operator->() const { return static_cast<Rep*>(object_); }
  Rep& operator*() const { return *static_cast<Rep*>(object_); }

 private:
  Shared* object_ = nullptr;
};

}  // namespace detail

// -- Strings ------------------------------------------------------------------------------------

/// Immutable shared text, in UTF-8.
class String {
 public:
  String() = default;
  String(std::string_view text);
  String(const std::string& text) : String(std::string_view(text)) {}
  String(const char* text) : String(std::string_view(text)) {}

  std::string_view view() const;
  operator std::string_view() const { return view(); }

  friend bool operator==(const String& a, std::string_view b) { return a.view() == b; }
  friend bool operator==(const String& a, const String& b) { return a.view() == b.view(); }

 private:
  friend class Value;
  detail::Ref<detail::StringRep> rep_;  // empty for the empty text
};

// -- Containers ---------------------------------------------------------------------------------

class Value;
class Array;
class Data;
struct Entry;

/// A handle on a dictionary from text to non-null values.
class Dictionary {
 public:
  class Iterator;

  Dictionary() = default;
  Dictionary(std::initializer_list<Entry> entries);
  /// A new, empty dictionary with room for `capacity` entries.
  static Dictionary create(std::size_t capacity = 0);

  explicit operator bool() const { return static_cast<bool>(rep_); }
  /// True for two handles on the same dictionary.
  bool isSame(const Dictionary& other) const { return rep_ == other.rep_; }

  std::size_t size() const;
  bool empty() const { return size() == 0; }
  bool contains(std::string_view key) const { return find(key) != nullptr; }

  /// The value under `key`, null when absent.
  Value get(std::string_view key) const;

  /// The value under `key` when it is of that type. Text is borrowed from the dictionary.
  std::optional<std::string_view> string(std::string_view key) const;
  std::optional<Number> number(std::string_view key) const;
  std::optional<bool> boolean(std::string_view key) const;
  std::optional<Date> date(std::string_view key) const;
  Dictionary dictionary(std::string_view key) const;
  Array array(std::string_view key) const;
  Data data(std::string_view key) const;

  /// Stores `value`, replacing an earlier value of the key. A null value removes the key.
  void set(std::string_view key, Value value);
  /// The same, sharing the key's text.
  template <std::same_as<String> Key>
  void set(const Key& key, Value value);
  bool remove(std::string_view key);

  Iterator begin() const;
  std::default_sentinel_t end() const { return {}; }

 private:
  friend class Value;
  explicit Dictionary(detail::Ref<detail::DictionaryRep> rep) : rep_(std::move(rep)) {}
  const Value* find(std::string_view key) const;
  void setShared(const String& key, Value value);
  detail::DictionaryRep& ownRep();

  detail::Ref<detail::DictionaryRep> rep_;
};

/// A handle on an array of values.
class Array {
 public:
  class Iterator;

  Array() = default;
  Array(std::initializer_list<Value> values);
  static Array create(std::size_t capacity = 0);

  explicit operator bool() const { return static_cast<bool>(rep_); }
  bool isSame(const Array& other) const { return rep_ == other.rep_; }

  std::size_t size() const;
  bool empty() const { return size() == 0; }

  /// The value at `index`, null beyond the end.
  Value at(std::size_t index) const;
  /// Replaces the value at `index`; does nothing beyond the end.
  void set(std::size_t index, Value value);
  void append(Value value);
  /// Removes the value at `index`; does nothing beyond the end.
  void remove(std::size_t index);

  const Value* begin() const;
  const Value* end() const;

 private:
  friend class Value;
  explicit Array(detail::Ref<detail::ArrayRep> rep) : rep_(std::move(rep)) {}
  detail::ArrayRep& ownRep();

  detail::Ref<detail::ArrayRep> rep_;
};

/// A handle on bytes that can be changed in place.
class Data {
 public:
  Data() = default;
  /// A new data value with a copy of `bytes`.
  explicit Data(ByteSpan bytes);

  explicit operator bool() const { return static_cast<bool>(rep_); }
  bool isSame(const Data& other) const { return rep_ == other.rep_; }

  std::size_t size() const { return bytes().size(); }
  /// The bytes themselves, shared with every handle on the same value.
  MutableByteSpan bytes() const;

 private:
  friend class Value;
  explicit Data(detail::Ref<detail::DataRep> rep) : rep_(std::move(rep)) {}
  detail::Ref<detail::DataRep> rep_;
};

// -- Values -------------------------------------------------------------------------------------

/// Any property-list value.
class Value {
 public:
  Value() = default;
  template <std::same_as<bool> Bool>
  Value(Bool value) : kind_(Kind::Boolean) {
    payload_.bits = value;
  }
  Value(Number value) : kind_(Kind::Number), numberKind_(value.kind_) {
    payload_.bits = value.bits_;
  }
  template <class Arithmetic>
  requires((std::integral<Arithmetic> && !std::same_as<Arithmetic, bool>) ||
           std::same_as<Arithmetic, float> || std::same_as<Arithmetic, double>)
      Value(Arithmetic value)
      : Value(Number(value)) {}
  Value(Date value) : kind_(Kind::Date) { payload_.real = value.secondsSinceEpoch(); }
  Value(const String& value) : Value(Kind::String, value.rep_.get()) {}
  Value(std::string_view value) : Value(String(value)) {}
  Value(const std::string& value) : Value(String(value)) {}
  Value(const char* value) : Value(String(value)) {}
  /// An empty handle makes a null value.
  Value(const Dictionary& value) : Value(Kind::Dictionary, value.rep_.get()) {}
  Value(const Array& value) : Value(Kind::Array, value.rep_.get()) {}
  Value(const Data& value) : Value(Kind::Data, value.rep_.get()) {}

  Value(const Value& other)
      : payload_(other.payload_), kind_(other.kind_), numberKind_(other.numberKind_) {
    if (isShared()) detail::retain(payload_.shared);
  }
  Value(Value&& other) noexcept
      : payload_(other.payload_), kind_(other.kind_), numberKind_(other.numberKind_) {
    other.kind_ = Kind::Null;
  }
  Value& operator=(Value other) noexcept {
    std::swap(payload_, other.payload_);
    std::swap(kind_, other.kind_);
    std::swap(numberKind_, other.numberKind_);
    return *this;
  }
  ~Value() {
    if (isShared()) detail::release(payload_.shared);
  }

  Kind kind() const { return kind_; }
  bool isNull() const { return kind_ == Kind::Null; }
  explicit operator bool() const { return !isNull(); }

  /// The value when it is of that type. Text is borrowed from the value.
  std::optional<std::string_view> string() const;
  std::optional<Number> number() const {
    if (kind_ != Kind::Number) return std::nullopt;
    return Number(payload_.bits, numberKind_);
  }
  std::optional<bool> boolean() const {
    if (kind_ != Kind::Boolean) return std::nullopt;
    return payload_.bits != 0;
  }
  std::optional<Date> date() const {
    if (kind_ != Kind::Date) return std::nullopt;
    return Date::sinceEpoch(payload_.real);
  }
  Dictionary dictionary() const {
    if (kind_ != Kind::Dictionary) return {};
    return Dictionary(detail::Ref<detail::DictionaryRep>(payload_.shared));
  }
  Array array() const {
    if (kind_ != Kind::Array) return {};
    return Array(detail::Ref<detail::ArrayRep>(payload_.shared));
  }
  Data data() const {
    if (kind_ != Kind::Data) return {};
    return Data(detail::Ref<detail::DataRep>(payload_.shared));
  }

  /// Equal kind and content; dictionaries are equal whatever the order of their entries.
  friend bool operator==(const Value& a, const Value& b);

 private:
  union Payload {
    std::uint64_t bits;
    double real;
    detail::Shared* shared;  // null only for the empty string
  };

  Value(Kind kind, detail::Shared* shared)
      : kind_(shared || kind == Kind::String ? kind : Kind::Null) {
    payload_.shared = shared;
    detail::retain(shared);
  }

  bool isShared() const { return kind_ >= Kind::String; }

  Payload payload_{.bits = 0};
  Kind kind_ = Kind::Null;
  NumberKind numberKind_ = NumberKind::Int8;
};

struct Entry {
  String key;
  Value value;
};

template <std::same_as<String> Key>  // in a template clang-tidy does not see the move
void Dictionary::set(const Key& key, Value value) {  // NOLINT(performance-unnecessary-value-param)
  setShared(key, std::move(value));
}

/// Walks the entries of a dictionary in the order of insertion.
class Dictionary::Iterator {
 public:
  using value_type = Entry;
  using difference_type = std::ptrdiff_t;

  Iterator() = default;
  const Entry& operator*() const { return *at_; }
  const Entry* operator->() const { return at_; }
  Iterator& operator++() {
    ++at_;
    skipRemoved();
    return *this;
  }
  void operator++(int) { ++*this; }
  friend bool operator==(const Iterator& a, std::default_sentinel_t) { return a.at_ == a.end_; }

 private:
  friend class Dictionary;
  Iterator(const Entry* at, const Entry* end) : at_(at), end_(end) { skipRemoved(); }
  void skipRemoved() {
    while (at_ != end_ && at_->value.isNull())
      ++at_;
  }

  const Entry* at_ = nullptr;
  const Entry* end_ = nullptr;
};

// -- Copies -------------------------------------------------------------------------------------

/// A new container that shares the elements of the original. An empty handle gives an empty
/// container.
Dictionary mutableCopy(const Dictionary& dictionary);
Array mutableCopy(const Array& array);
Data mutableCopy(const Data& data);

/// A copy that shares nothing changeable with the original.
Value deepCopy(const Value& value);

}  // namespace tavrel::plist
