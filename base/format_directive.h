// One conversion of a printf-style format: its syntax, and the argument that it takes.
//
// Everything here is constexpr: the compiler checks the program's literals; format texts from
// outside are checked when they are used.
#pragma once

#include <cstddef>
#include <cstdint>
#include <limits>
#include <optional>
#include <span>
#include <string_view>

#include "base/limits.h"

namespace tavrel {

/// The types of arguments. `Int` has 32 bits (narrower integers are promoted), `Long` 64.
enum class ArgumentType : std::uint8_t { Int, Long, Double, Text, Pointer, Object };

/// "%[flags][width][.precision][length]conversion". "%{public}@" and the like carry an annotation
/// in braces, which has no effect on the text.
struct Directive {
  bool leftAlign = false;      // -
  bool plusSign = false;       // +
  bool blankSign = false;      // blank
  bool alternateForm = false;  // #
  bool zeroPad = false;        // 0
  bool widthFromArgument = false;
  bool precisionFromArgument = false;
  std::int32_t width = 0;
  std::optional<std::int32_t> precision = std::nullopt;
  unsigned char lengthBits =
      32;  // of an integer: 8 (hh), 16 (h), 32, 64 (l, ll, j, q), size_t (z, t)
  char conversion = 0;
};

namespace format_detail {

constexpr bool isOneOf(char c, std::string_view set) {
  for (const char member : set) {
    if (member == c) return true;
  }
  return false;
}

constexpr bool isConversion(char c) {
  return isOneOf(c, "diouxXcsp@eEfFgGaA%");
}

constexpr char frontOf(std::string_view text) {
  return text.empty() ? '\0' : text.front();
}

constexpr bool takeOneOf(std::string_view& text, std::string_view set) {
  if (!isOneOf(frontOf(text), set)) return false;
  text.remove_prefix(1);
  return true;
}

constexpr bool take(std::string_view& text, std::string_view prefix) {
  if (!text.starts_with(prefix)) return false;
  text.remove_prefix(prefix.size());
  return true;
}

// Reads digits up to the largest width; nothing when the number is larger, with `text` at the digit
// that made it too large.
constexpr std::optional<std::int32_t> takeNumber(std::string_view& text) {
  std::int32_t number = 0;
  while (frontOf(text) >= '0' && frontOf(text) <= '9') {
    number = number * 10 + (text.front() - '0');
    if (number > limits::kLargestFormatWidth) return std::nullopt;
    text.remove_prefix(1);
  }
  return number;
}

constexpr void takeFlags(std::string_view& text, Directive& directive) {
  for (;; text.remove_prefix(1)) {
    switch (frontOf(text)) {
      case '-':
        directive.leftAlign = true;
        break;
      case '+':
        directive.plusSign = true;
        break;
      case ' ':
        directive.blankSign = true;
        break;
      case '#':
        directive.alternateForm = true;
        break;
      case '0':
        directive.zeroPad = true;
        break;
      default:
        return;
    }
  }
}

constexpr void takeLength(std::string_view& text, Directive& directive) {
  if (take(text, "hh")) {
    directive.lengthBits = 8;
  } else if (take(text, "h")) {
    directive.lengthBits = 16;
  } else if (take(text, "ll") || takeOneOf(text, "ljq")) {
    directive.lengthBits = 64;
  } else if (takeOneOf(text, "zt")) {
    directive.lengthBits = std::numeric_limits<std::size_t>::digits;
  }
}

}  // namespace format_detail

/// Takes one directive from the front of `text`, which begins after the "%". Nothing when the
/// directive is incomplete, or has an unknown conversion (such as "%n") or a width beyond the
/// limit; `text` then begins at the offending character, or is empty when the directive is
/// incomplete.
constexpr std::optional<Directive> takeDirective(std::string_view& text) {
  using namespace format_detail;
  Directive directive;
  // Most directives consist of a conversion only.
  if (isConversion(frontOf(text))) {
    directive.conversion = text.front();
    text.remove_prefix(1);
    return directive;
  }
  if (take(text, "{")) {
    const std::size_t close = text.find('}');
    if (close == std::string_view::npos) {
      text = {};
      return std::nullopt;
    }
    text.remove_prefix(close + 1);
  }
  takeFlags(text, directive);
  if (take(text, "*")) {
    directive.widthFromArgument = true;
  } else if (const auto width = takeNumber(text)) {
    directive.width = *width;
  } else {
    return std::nullopt;
  }
  if (take(text, ".")) {
    if (take(text, "*")) {
      directive.precisionFromArgument = true;
    } else if (const auto precision = takeNumber(text)) {
      directive.precision = *precision;
    } else {
      return std::nullopt;
    }
  }
  takeLength(text, directive);
  directive.conversion = frontOf(text);
  if (!isConversion(directive.conversion)) return std::nullopt;
  text.remove_prefix(1);
  return directive;
}

/// True when the directive accepts an argument of that type: the widths of integers must agree,
/// their signedness need not. "%@" takes texts as well as objects.
constexpr bool accepts(const Directive& directive, ArgumentType type) {
  switch (directive.conversion) {
    case 'd':
    case 'i':
    case 'o':
    case 'u':
    case 'x':
    case 'X':
      return type == (directive.lengthBits == 64 ? ArgumentType::Long : ArgumentType::Int);
    case 'c':
      return type == ArgumentType::Int && directive.lengthBits == 32;
    case 's':
      return type == ArgumentType::Text && directive.lengthBits == 32;
    case 'p':
      return type == ArgumentType::Pointer;
    case '@':
      return type == ArgumentType::Object || type == ArgumentType::Text;
    case '%':
      return false;
    default:
      return type == ArgumentType::Double;  // "%lf" is the same as "%f"
  }
}

/// The directive that takes the argument of a "*".
inline constexpr Directive kStar{.conversion = 'd'};

enum class FormatFault : std::uint8_t {
  None,
  NotAConversion,
  WrongArgument,
  MissingArgument,
  UnusedArgument
};

/// Compares a format with the types of all its arguments.
constexpr FormatFault checkFormat(std::string_view text, std::span<const ArgumentType> types) {
  std::size_t next = 0;
  FormatFault fault = FormatFault::None;
  const auto expect = [&](const Directive& directive) {
    if (fault != FormatFault::None) return;
    if (next == types.size()) {
      fault = FormatFault::MissingArgument;
    } else if (!accepts(directive, types[next++])) {
      fault = FormatFault::WrongArgument;
    }
  };
  for (std::size_t percent = text.find('%'); percent != std::string_view::npos;
       percent = text.find('%')) {
    text.remove_prefix(percent + 1);
    const auto directive = takeDirective(text);
    if (!directive) return FormatFault::NotAConversion;
    if (directive->widthFromArgument) expect(kStar);
    if (directive->precisionFromArgument) expect(kStar);
    if (directive->conversion != '%') expect(*directive);
    if (fault != FormatFault::None) return fault;
  }
  return next == types.size() ? FormatFault::None : FormatFault::UnusedArgument;
}

}  // namespace tavrel
