// A format string from outside with up to three arguments. It must be printed in proportion to its
// arguments or refused without output; what C defines must be printed as the C library prints it.
//
// Input: the number of arguments, 9 bytes for each (type and bits), the format.
#include <array>
#include <bit>
#include <cmath>
#include <cstdint>
#include <cstdio>
#include <cstdlib>
#include <string>
#include <variant>
#include <vector>

#include "base/format.h"

namespace {

using namespace tavrel;

constexpr std::size_t kArgumentBytes = 9;
constexpr std::size_t kLargestPiece = limits::kLargestFormatWidth + 512;

using Argument = std::variant<int, long, double, const char*, const void*, plist::Value>;

Argument argumentOf(unsigned type, std::uint64_t bits, std::string& text) {
  const auto word = std::bit_cast<std::int64_t>(bits);
  switch (type % 6) {
    case 0:
      return static_cast<int>(word);
    case 1:
      return word;
    case 2: {
      const auto real = std::bit_cast<double>(bits);
      return std::isnan(real) ? std::abs(real) : real;  // C may print the sign of a not-a-number
    }
    case 3:
      for (; bits % 256 != 0; bits /= 256)
        text += static_cast<char>(bits % 256);
      return text.c_str();
    case 4:
      return reinterpret_cast<const void*>(bits);  // NOLINT(performance-no-int-to-ptr)
    default:
      return plist::Value(plist::Dictionary{{"bits", word}});
  }
}

// C leaves zero bytes, and length modifiers of conversions other than integers, undefined.
bool isDefinedByC(std::string_view format) {
  if (format.find('\0') != std::string_view::npos) return false;
  while (true) {
    const std::size_t percent = format.find('%');
    if (percent == std::string_view::npos) return true;
    format.remove_prefix(percent + 1);
    if (format.starts_with('{')) return false;
    const char* const start = format.data();
    const auto directive = takeDirective(format);
    if (directive->conversion == '@') return false;
    const char* const last = format.data() - 1;
    const bool hasLength = last != start && format_detail::isOneOf(last[-1], "hljztq");
    if (hasLength && !format_detail::isOneOf(directive->conversion, "diouxX")) return false;
  }
}

// Expands the arguments, one by one, into those of a C call.
template <class... Arguments>
int printWithC(char* out, std::size_t size, const char* format,
               const std::vector<Argument>& arguments, Arguments... taken) {
  if (sizeof...(taken) == arguments.size()) {
    int (*const print)(char*, std::size_t, const char*, ...) = std::snprintf;
    return print(out, size, format, taken...);
  }
  if constexpr (sizeof...(taken) < 3) {
    return std::visit(
        [&]<class Next>(Next next) -> int {
          if constexpr (std::is_same_v<Next, plist::Value>) {
            std::abort();  // only "%@" prints one
          } else {
            return printWithC(out, size, format, arguments, taken..., next);
          }
        },
        arguments[sizeof...(taken)]);
  }
  std::abort();
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const ByteSpan input = std::as_bytes(std::span(data, size));
  const std::size_t count = loadByte(input, 0).value_or(0) % 4;
  const auto rest = slice(input, 1 + count * kArgumentBytes, 0);
  if (!rest) return 0;
  const std::string format(asText(input.subspan(1 + count * kArgumentBytes)));

  std::array<std::string, 3> texts;
  std::vector<Argument> arguments;
  std::vector<FormatArgument> given;
  for (std::size_t i = 0; i < count; ++i) {
    const std::size_t at = 1 + i * kArgumentBytes;
    arguments.push_back(argumentOf(*loadByte(input, at), *loadLittle64(input, at + 1), texts[i]));
    std::visit([&](const auto& argument) { given.emplace_back(argument); }, arguments.back());
  }

  std::string out = "kept ";
  const Status status = appendForeignFormat(out, format, given);
  if (!out.starts_with("kept ")) std::abort();
  if (!status) {
    if (out != "kept " || status.error().message.empty()) std::abort();
    return 0;
  }
  const std::string_view printed = std::string_view(out).substr(5);
  if (printed.size() > format.size() + count * kLargestPiece) std::abort();
  if (!isDefinedByC(format)) return 0;
  std::vector<char> expected(format.size() + count * kLargestPiece + 1);
  const int length = printWithC(expected.data(), expected.size(), format.c_str(), arguments);
  if (printed != std::string_view(expected.data(), static_cast<std::size_t>(length))) {
    std::abort();
  }
  return 0;
}
