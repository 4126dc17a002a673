// printf-style formatting with objects. The text is exactly what C's printf prints.
//
//   std::string line = format("daily tasks for day %d", day);
//   appendFormat(out, "%{public}@: %5.2f", object, value);
//
// The compiler checks format literals against their arguments. Format texts from a device go
// through `appendForeignFormat`, which refuses a text that needs other arguments than those given.
// No missing argument is ever read.
//
// Beyond C: "%@" prints an object's text (base/text.h), "(null)" for a null one, with width and
// precision in bytes as for "%s"; not-a-number has no sign; a null text prints "(null)" whatever
// the precision. The locale is always C's. Texts may hold zero bytes.
#pragma once

#include <array>
#include <concepts>
#include <cstdint>
#include <span>
#include <string>
#include <string_view>
#include <type_traits>
#include <variant>

#include "base/expected.h"
#include "base/format_directive.h"
#include "base/plist.h"

namespace tavrel {

/// One argument. It borrows texts; they must outlive the call and must not be part of the string to
/// which the result is appended.
class FormatArgument {
 public:
  template <std::integral Integer>
  requires(sizeof(Integer) <= 4) FormatArgument(Integer value)
      : value_(static_cast<std::uint32_t>(value)) {}
  template <std::integral Integer>
  requires(sizeof(Integer) == 8) FormatArgument(Integer value)
      : value_(static_cast<std::uint64_t>(value)) {}
  FormatArgument(double value) : value_(value) {}
  FormatArgument(float value) : value_(static_cast<double>(value)) {}
  FormatArgument(std::string_view text) : value_(text) {}
  FormatArgument(const std::string& text) : value_(std::string_view(text)) {}
  /// A null pointer prints as "(null)".
  FormatArgument(const char* text) {
    if (text) {
      value_ = std::string_view(text);
    } else {
      value_ = NullText{};
    }
  }
  FormatArgument(const plist::String& text) : value_(text.view()) {}
  FormatArgument(const plist::Value& object) : value_(object) {}
  FormatArgument(const plist::Dictionary& object) : value_(plist::Value(object)) {}
  FormatArgument(const plist::Array& object) : value_(plist::Value(object)) {}
  FormatArgument(const plist::Data& object) : value_(plist::Value(object)) {}
  FormatArgument(plist::Date object) : value_(plist::Value(object)) {}
  FormatArgument(const void* pointer) : value_(pointer) {}

  struct NullText {};
  using Alternatives = std::variant<std::uint32_t, std::uint64_t, double, std::string_view,
                                    NullText, const void*, plist::Value>;

  ArgumentType type() const {
    static constexpr ArgumentType kTypes[] = {
        ArgumentType::Int,  ArgumentType::Long,    ArgumentType::Double, ArgumentType::Text,
        ArgumentType::Text, ArgumentType::Pointer, ArgumentType::Object};
    return kTypes[value_.index()];
  }
  const Alternatives& value() const { return value_; }

 private:
  Alternatives value_;
};

/// The type that an argument of C++ type `T` has in a format.
template <class T>
constexpr ArgumentType argumentTypeOf() {
  using Plain = std::decay_t<T>;
  static_assert(!std::is_enum_v<Plain>, "convert an enumerator to the integer that is meant");
  if constexpr (std::integral<Plain>) {
    return sizeof(Plain) == 8 ? ArgumentType::Long : ArgumentType::Int;
  } else if constexpr (std::floating_point<Plain>) {
    return ArgumentType::Double;
  } else if constexpr (std::convertible_to<Plain, std::string_view>) {
    return ArgumentType::Text;
  } else if constexpr (std::is_pointer_v<Plain>) {
    return ArgumentType::Pointer;
  } else {
    return ArgumentType::Object;
  }
}

/// A format literal whose directives fit arguments of the types `Arguments`.
template <class... Arguments>
class CheckedFormat {
 public:
  template <std::size_t N>
  consteval CheckedFormat(const char (&text)[N]) : text_(text, N - 1) {
    constexpr std::array<ArgumentType, sizeof...(Arguments)> kTypes{argumentTypeOf<Arguments>()...};
    const FormatFault fault = checkFormat(text_, kTypes);
    if (fault == FormatFault::NotAConversion) throw "not a conversion";
    if (fault == FormatFault::WrongArgument) throw "the format and its argument do not agree";
    if (fault == FormatFault::MissingArgument) throw "the format asks for more arguments";
    if (fault == FormatFault::UnusedArgument) throw "the format does not use all its arguments";
  }

  constexpr std::string_view text() const { return text_; }

 private:
  std::string_view text_;
};

template <class... Arguments>
using FormatOf = CheckedFormat<std::type_identity_t<Arguments>...>;

/// Appends the formatted text. On failure it appends nothing, and the error says which directive is
/// wrong and why. The limit on widths and precisions (limits::kLargestFormatWidth) also holds when
/// they come from an argument, so that the arguments' number bounds the length of the text.
Status appendForeignFormat(std::string& out, std::string_view format,
                           std::span<const FormatArgument> arguments);

namespace format_detail {
void appendChecked(std::string& out, std::string_view format,
                   std::span<const FormatArgument> arguments);
}  // namespace format_detail

/// Appends the formatted text of a literal. A width or precision from an argument is clamped to the
/// limit.
template <class... Arguments>
void appendFormat(std::string& out, FormatOf<Arguments...> text, const Arguments&... arguments) {
  const std::array<FormatArgument, sizeof...(Arguments)> list{FormatArgument(arguments)...};
  format_detail::appendChecked(out, text.text(), list);
}

template <class... Arguments>
std::string format(FormatOf<Arguments...> text, const Arguments&... arguments) {
  std::string out;
  appendFormat(out, text, arguments...);
  return out;
}

}  // namespace tavrel
