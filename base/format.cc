#include "base/format.h"

#include <algorithm>
#include <cassert>
#include <charconv>
#include <cmath>
#include <cstdio>
#include <optional>
#include <utility>

#include "base/text.h"

namespace tavrel {
namespace {

// What to do when a width or precision from an argument exceeds the limit.
enum class Excess { Clamp, Refuse };

// The longest text of a double: 309 digits before the point, the point, and the decimals.
constexpr std::size_t kDoubleText = limits::kLargestFormatWidth + 320;

// How many bytes of a wrong directive an error quotes.
constexpr std::size_t kQuotedDirective = 40;

std::size_t paddingOf(const Directive& directive, std::size_t length) {
  const auto width = static_cast<std::size_t>(directive.width);
  return width > length ? width - length : 0;
}

std::string_view cut(const Directive& directive, std::string_view text) {
  return directive.precision ? text.substr(0, static_cast<std::size_t>(*directive.precision))
                             : text;
}

void appendPadded(std::string& out, const Directive& directive, std::string_view text) {
  const std::size_t padding = paddingOf(directive, text.size());
  if (padding == 0) {
    out += text;
    return;
  }
  if (!directive.leftAlign) out.append(padding, ' ');
  out += text;
  if (directive.leftAlign) out.append(padding, ' ');
}

// The sign and the base ("0x") of a number, which precede the zeros that pad it.
class Prefix {
 public:
  void append(char c) { text_[length_++] = c; }
  std::string_view view() const { return {text_, length_}; }

 private:
  char text_[3];
  std::size_t length_ = 0;
};

Prefix signOf(const Directive& directive, bool negative) {
  Prefix prefix;
  if (negative) {
    prefix.append('-');
  } else if (directive.plusSign) {
    prefix.append('+');
  } else if (directive.blankSign) {
    prefix.append(' ');
  }
  return prefix;
}

void appendNumber(std::string& out, const Directive& directive, const Prefix& prefix,
                  std::size_t zeros, std::string_view digits, bool zeroPad) {
  std::size_t padding = paddingOf(directive, prefix.view().size() + zeros + digits.size());
  if (padding != 0 && !directive.leftAlign) {
    if (zeroPad) {
      zeros += std::exchange(padding, 0);
    } else {
      out.append(padding, ' ');
    }
  }
  out += prefix.view();
  if (zeros != 0) out.append(zeros, '0');
  out += digits;
  if (directive.leftAlign) out.append(padding, ' ');
}

void appendMagnitude(std::string& out, const Directive& directive, Prefix prefix,
                     std::uint64_t magnitude) {
  const char conversion = directive.conversion;
  const bool hexadecimal = conversion == 'x' || conversion == 'X';
  char buffer[24];
  char* end = buffer;
  if (magnitude != 0 || directive.precision != 0) {
    int base = conversion == 'o' ? 8 : 10;
    if (hexadecimal) base = 16;
    end = std::to_chars(buffer, buffer + sizeof buffer, magnitude, base).ptr;
  }
  if (conversion == 'X') {
    for (char* c = buffer; c != end; ++c) {
      if (*c >= 'a') *c = static_cast<char>(*c - 'a' + 'A');
    }
  }
  const std::string_view digits(buffer, static_cast<std::size_t>(end - buffer));
  const auto least = static_cast<std::size_t>(directive.precision.value_or(0));
  std::size_t zeros = least > digits.size() ? least - digits.size() : 0;
  if (directive.alternateForm && conversion == 'o' && zeros == 0 && !digits.starts_with('0')) {
    zeros = 1;
  }
  if (directive.alternateForm && hexadecimal && magnitude != 0) {
    prefix.append('0');
    prefix.append(conversion);
  }
  appendNumber(out, directive, prefix, zeros, digits, directive.zeroPad && !directive.precision);
}

void appendInteger(std::string& out, const Directive& directive, std::uint64_t bits) {
  const unsigned unused = 64U - directive.lengthBits;
  if (directive.conversion == 'd' || directive.conversion == 'i') {
    const auto value = static_cast<std::int64_t>(bits << unused) >> unused;
    const auto word = static_cast<std::uint64_t>(value);
    appendMagnitude(out, directive, signOf(directive, value < 0), value < 0 ? 0 - word : word);
  } else {
    appendMagnitude(out, directive, {}, bits << unused >> unused);
  }
}

// The C library's digits of a positive number. Without a precision, the library's default applies.
template <std::size_t Size>
std::string_view digitsOf(char (&text)[Size], const Directive& directive, double value) {
  const int precision = directive.precision.value_or(-1);
  const bool full = directive.alternateForm;
  const auto print = [&](const char* plain, const char* alternate) {
    int (*const printer)(char*, std::size_t, const char*, ...) = std::snprintf;
    return printer(text, Size, full ? alternate : plain, precision, value);
  };
  const auto length = [&] {
    switch (directive.conversion) {
      case 'e':
        return print("%.*e", "%#.*e");
      case 'E':
        return print("%.*E", "%#.*E");
      case 'f':
        return print("%.*f", "%#.*f");
      case 'F':
        return print("%.*F", "%#.*F");
      case 'g':
        return print("%.*g", "%#.*g");
      case 'G':
        return print("%.*G", "%#.*G");
      case 'a':
        return print("%.*a", "%#.*a");
      default:
        return print("%.*A", "%#.*A");
    }
  }();
  return {text, static_cast<std::size_t>(length)};
}

void appendDouble(std::string& out, const Directive& directive, double value) {
  Prefix prefix = signOf(directive, std::signbit(value) && !std::isnan(value));
  char text[kDoubleText];
  std::string_view digits = digitsOf(text, directive, std::abs(value));
  if (digits.starts_with("0x") || digits.starts_with("0X")) {
    prefix.append(digits[0]);
    prefix.append(digits[1]);
    digits.remove_prefix(2);
  }
  appendNumber(out, directive, prefix, 0, digits, directive.zeroPad && std::isfinite(value));
}

void appendPointer(std::string& out, Directive directive, const void* pointer) {
  if (!pointer) return appendPadded(out, directive, "(nil)");
  directive.conversion = 'x';
  directive.alternateForm = true;
  appendMagnitude(out, directive, signOf(directive, false),
                  reinterpret_cast<std::uintptr_t>(pointer));
}

void appendObject(std::string& out, const Directive& directive, const plist::Value& object) {
  if (object.isNull()) return appendPadded(out, directive, "(null)");
  if (const auto text = object.string()) return appendPadded(out, directive, cut(directive, *text));
  const std::size_t start = out.size();
  appendText(out, object);
  if (directive.precision) {
    out.resize(std::min(out.size(), start + static_cast<std::size_t>(*directive.precision)));
  }
  const std::size_t padding = paddingOf(directive, out.size() - start);
  out.insert(directive.leftAlign ? out.size() : start, padding, ' ');
}

// Prints an argument that the directive accepts.
struct Printer {
  std::string& out;
  const Directive& directive;

  void operator()(std::uint32_t bits) const {
    if (directive.conversion == 'c') {
      const char c = static_cast<char>(bits);
      appendPadded(out, directive, {&c, 1});
    } else {
      appendInteger(out, directive, bits);
    }
  }
  void operator()(std::uint64_t bits) const { appendInteger(out, directive, bits); }
  void operator()(double value) const { appendDouble(out, directive, value); }
  void operator()(std::string_view text) const {
    appendPadded(out, directive, cut(directive, text));
  }
  void operator()(FormatArgument::NullText) const { appendPadded(out, directive, "(null)"); }
  void operator()(const void* pointer) const { appendPointer(out, directive, pointer); }
  void operator()(const plist::Value& object) const { appendObject(out, directive, object); }
};

std::string_view nameOf(ArgumentType type) {
  static constexpr std::string_view kNames[] = {
      "a 32-bit integer", "a 64-bit integer", "a double", "a text", "a pointer", "an object"};
  return kNames[static_cast<std::size_t>(type)];
}

std::string typeMismatch(const Directive& directive, ArgumentType given) {
  for (const auto wanted : {ArgumentType::Int, ArgumentType::Long, ArgumentType::Double,
                            ArgumentType::Text, ArgumentType::Pointer, ArgumentType::Object}) {
    if (!accepts(directive, wanted)) continue;
    return format("it takes %s, but its argument is %s", nameOf(wanted), nameOf(given));
  }
  return format("'%c' takes no length", directive.conversion);
}

std::string malformed(std::string_view rest) {
  if (rest.empty()) return "the format ends within it";
  if (rest.front() >= '0' && rest.front() <= '9') {
    return format("its width or precision is more than %d", limits::kLargestFormatWidth);
  }
  return "its last character is no conversion";
}

class Engine {
 public:
  Engine(std::string& out, std::span<const FormatArgument> arguments, Excess excess)
      : out_(out), arguments_(arguments), excess_(excess) {}

  Status run(std::string_view text) {
    std::string_view rest = text;
    while (true) {
      const std::size_t percent = rest.find('%');
      out_ += rest.substr(0, percent);
      if (percent == std::string_view::npos) break;
      const std::size_t start = text.size() - rest.size() + percent;
      rest.remove_prefix(percent + 1);
      auto directive = takeDirective(rest);
      const bool printed = directive ? print(*directive) : fail(malformed(rest));
      if (!printed) {
        const std::size_t end = text.size() - rest.size() + (directive || rest.empty() ? 0 : 1);
        return wrongDirective(text.substr(start, end - start), start);
      }
    }
    if (next_ == arguments_.size()) return Done{};
    return Error{format("the format uses %zu of its %zu arguments", next_, arguments_.size())};
  }

 private:
  bool fail(std::string reason) {
    reason_ = std::move(reason);
    return false;
  }

  Error wrongDirective(std::string_view directive, std::size_t offset) const {
    return Error{format("%s at byte %zu of the format: %s",
                        quotedText(directive.substr(0, kQuotedDirective)), offset, reason_)};
  }

  bool print(Directive& directive) {
    if (directive.widthFromArgument && !takeWidth(directive)) return false;
    if (directive.precisionFromArgument && !takePrecision(directive)) return false;
    if (directive.conversion == '%') {
      out_ += '%';
      return true;
    }
    const FormatArgument* argument = take(directive);
    if (!argument) return false;
    std::visit(Printer{out_, directive}, argument->value());
    return true;
  }

  const FormatArgument* take(const Directive& directive) {
    if (next_ == arguments_.size()) {
      fail("no argument is left for it");
      return nullptr;
    }
    const FormatArgument& argument = arguments_[next_++];
    if (accepts(directive, argument.type())) return &argument;
    fail(typeMismatch(directive, argument.type()));
    return nullptr;
  }

  std::optional<std::int32_t> takeStar() {
    const FormatArgument* argument = take(kStar);
    if (!argument) return std::nullopt;
    return static_cast<std::int32_t>(std::get<std::uint32_t>(argument->value()));
  }

  // Clamps or refuses a width or precision from an argument that is too large.
  bool limit(std::int64_t& size) {
    if (size <= limits::kLargestFormatWidth) return true;
    if (excess_ == Excess::Refuse) {
      return fail(format("its width or precision is %lld, more than %d", size,
                         limits::kLargestFormatWidth));
    }
    size = limits::kLargestFormatWidth;
    return true;
  }

  bool takeWidth(Directive& directive) {
    const auto star = takeStar();
    if (!star) return false;
    std::int64_t width = *star;
    if (width < 0) {
      directive.leftAlign = true;
      width = -width;
    }
    if (!limit(width)) return false;
    directive.width = static_cast<std::int32_t>(width);
    return true;
  }

  bool takePrecision(Directive& directive) {
    const auto star = takeStar();
    if (!star) return false;
    if (*star < 0) return true;
    std::int64_t precision = *star;
    // The precision of a text only shortens it, so our own literals may use any.
    const bool shortens = directive.conversion == 's' || directive.conversion == '@';
    if (!(shortens && excess_ == Excess::Clamp) && !limit(precision)) return false;
    directive.precision = static_cast<std::int32_t>(precision);
    return true;
  }

  std::string& out_;
  std::span<const FormatArgument> arguments_;
  Excess excess_;
  std::size_t next_ = 0;
  std::string reason_;
};

}  // namespace

Status appendForeignFormat(std::string& out, std::string_view format,
                           std::span<const FormatArgument> arguments) {
  const std::size_t length = out.size();
  Status status = Engine(out, arguments, Excess::Refuse).run(format);
  if (!status) out.resize(length);
  return status;
}

void format_detail::appendChecked(std::string& out, std::string_view format,
                                  std::span<const FormatArgument> arguments) {
  [[maybe_unused]] const Status status = Engine(out, arguments, Excess::Clamp).run(format);
  assert(status);
}

}  // namespace tavrel
