#include "platform/linux/health/flash_life.h"

#include <charconv>

#include "base/ascii.h"
#include "base/format.h"
#include "platform/linux/health/log_page.h"

namespace tavrel::health {
namespace {

constexpr std::string_view kLifeA =
    "life used of memory type A, the upper end of its step of 10 %; "
    "110 is past its end";
constexpr std::string_view kLifeB = "the same of memory type B";
constexpr std::string_view kPreEol = "reserve blocks: 1 normal, 2 80 % used, 3 90 % used";

constexpr FigureKind kEmmc[] = {
    {"life_a_pct", kPlain, Resets::NotACounter, "EXT_CSD [268], life_time", kLifeA},
    {"life_b_pct", kPlain, Resets::NotACounter, "EXT_CSD [269], life_time", kLifeB},
    {"pre_eol", kPlain, Resets::NotACounter, "EXT_CSD [267], pre_eol_info", kPreEol},
};
constexpr FigureKind kUfs[] = {
    {"life_a_pct", kPlain, Resets::NotACounter, "life_time_estimation_a", kLifeA},
    {"life_b_pct", kPlain, Resets::NotACounter, "life_time_estimation_b", kLifeB},
    {"pre_eol", kPlain, Resets::NotACounter, "eol_info", kPreEol},
};

constexpr std::size_t kRevision = 192, kPreEolOffset = 267;
constexpr std::uint8_t kRevisionOf50 = 7;
constexpr unsigned kLastStep = 11, kLastPreEol = 3;

// Takes the next hexadecimal number from the beginning of `text`.
std::optional<unsigned> takeNumber(std::string_view& text) {
  text = trimmed(text);
  if (text.starts_with("0x") || text.starts_with("0X")) text.remove_prefix(2);
  unsigned value = 0;
  const auto [end, fault] = std::from_chars(text.data(), text.data() + text.size(), value, 16);
  if (fault != std::errc()) return std::nullopt;
  text.remove_prefix(static_cast<std::size_t>(end - text.data()));
  if (!text.empty() && trimmed(text.substr(0, 1)) == text.substr(0, 1)) return std::nullopt;
  return value;
}

std::optional<unsigned> numberOf(std::optional<std::string_view> text) {
  return text ? takeNumber(*text) : std::nullopt;
}

// 0 means "not defined", and values beyond the scale are reserved.
Figures figuresOf(std::span<const FigureKind, 3> kinds, std::optional<unsigned> a,
                  std::optional<unsigned> b, std::optional<unsigned> preEol) {
  Figures figures;
  if (a && *a >= 1 && *a <= kLastStep) figures.push_back({&kinds[0], std::int64_t{*a} * 10});
  if (b && *b >= 1 && *b <= kLastStep) figures.push_back({&kinds[1], std::int64_t{*b} * 10});
  if (preEol && *preEol >= 1 && *preEol <= kLastPreEol) figures.push_back({&kinds[2], *preEol});
  return figures;
}

}  // namespace

std::span<const FigureKind> emmcKinds() {
  return kEmmc;
}
std::span<const FigureKind> ufsKinds() {
  return kUfs;
}

Expected<Figures> emmcFigures(ByteSpan extCsd) {
  if (extCsd.size() != kExtCsdBytes) {
    return Error{format("EXT_CSD has %zu bytes instead of %zu", extCsd.size(), kExtCsdBytes)};
  }
  if (isBlank(extCsd)) return Error{"EXT_CSD is blank"};
  const std::uint8_t revision = *loadByte(extCsd, kRevision);
  if (revision < kRevisionOf50) {
    return Error{format("EXT_CSD revision %d, before eMMC 5.0, has no health", revision)};
  }
  return figuresOf(kEmmc, loadByte(extCsd, kPreEolOffset + 1), loadByte(extCsd, kPreEolOffset + 2),
                   loadByte(extCsd, kPreEolOffset));
}

Figures emmcFigures(std::optional<std::string_view> lifeTime,
                    std::optional<std::string_view> preEol) {
  std::string_view both = lifeTime.value_or("");
  const auto a = takeNumber(both);
  const auto b = a ? takeNumber(both) : std::nullopt;
  return figuresOf(kEmmc, a, b, numberOf(preEol));
}

Figures ufsFigures(std::optional<std::string_view> lifeA, std::optional<std::string_view> lifeB,
                   std::optional<std::string_view> preEol) {
  return figuresOf(kUfs, numberOf(lifeA), numberOf(lifeB), numberOf(preEol));
}

}  // namespace tavrel::health
