#include "statsd/statsd_line.h"

#include <cmath>

#include "base/parse_number.h"

namespace tavrel {
namespace {

std::string_view takeUntil(std::string_view& rest, char end) {
  const std::size_t at = rest.find(end);
  const std::string_view part = rest.substr(0, at);
  rest.remove_prefix(at == std::string_view::npos ? rest.size() : at + 1);
  return part;
}

// Nothing when two signs follow each other.
std::optional<std::string_view> withoutPlus(std::string_view text) {
  if (!text.starts_with('+')) return text;
  text.remove_prefix(1);
  if (text.starts_with('-')) return std::nullopt;
  return text;
}

std::optional<double> parseFinite(std::string_view text) {
  const auto digits = withoutPlus(text);
  const auto number = digits ? parseNumber<double>(*digits) : std::nullopt;
  return number && std::isfinite(*number) ? number : std::nullopt;
}

std::optional<StatsdValue> parseValue(std::string_view text, const StatsdLine& line) {
  const bool isScalar = line.kind != StatsdKind::Series;
  const double rate = line.kind == StatsdKind::Counter ? line.rate : 1;
  if (isScalar && rate == 1) {
    const auto digits = withoutPlus(text);
    const auto whole = digits ? parseNumber<std::int64_t>(*digits) : std::nullopt;
    if (whole) return StatsdValue{static_cast<double>(*whole), whole};
  }
  const auto number = parseFinite(text);
  if (!number) return std::nullopt;
  const double recorded = *number / rate;
  if (isScalar && !(recorded >= -0x1p63 && recorded < 0x1p63)) return std::nullopt;
  return StatsdValue{*number, std::nullopt};
}

bool parseRate(std::string_view text, double& rate) {
  const auto number = parseFinite(text);
  if (!number || !(*number > 0 && *number <= 1)) return false;
  rate = *number;
  return true;
}

// Fields for tags, the sender's container or its time.
bool isIgnoredField(std::string_view field) {
  return field.starts_with('#') || field.starts_with('T') || field.starts_with("c:") ||
         field.starts_with("e:") || field.starts_with("card:");
}

StatsdParse parseKind(std::string_view type, std::string_view values, StatsdKind& kind) {
  if (type == "c") {
    kind = StatsdKind::Counter;
  } else if (type == "ms" || type == "h" || type == "d") {
    kind = StatsdKind::Series;
  } else if (type == "g") {
    const bool hasSign = values.starts_with('+') || values.starts_with('-');
    kind = hasSign ? StatsdKind::GaugeDelta : StatsdKind::Gauge;
  } else {
    return type == "s" ? StatsdParse::Unsupported : StatsdParse::Malformed;
  }
  return StatsdParse::Good;
}

}  // namespace

StatsdParse parseStatsdLine(std::string_view text, StatsdLine& result) {
  if (text.starts_with("_e{") || text.starts_with("_sc|")) return StatsdParse::Unsupported;
  std::string_view rest = text;
  const std::string_view nameAndTags = takeUntil(rest, ':');
  result.name = nameAndTags.substr(0, nameAndTags.find_first_of(",;"));
  std::string_view values = takeUntil(rest, '|');
  const std::string_view type = takeUntil(rest, '|');
  if (result.name.empty()) return StatsdParse::Malformed;
  if (const auto kind = parseKind(type, values, result.kind); kind != StatsdParse::Good)
    return kind;

  result.rate = 1;
  while (!rest.empty()) {
    const std::string_view field = takeUntil(rest, '|');
    if (field.starts_with('@') ? !parseRate(field.substr(1), result.rate) : !isIgnoredField(field))
      return StatsdParse::Malformed;
  }

  result.values.clear();
  do {
    const auto value = parseValue(takeUntil(values, ':'), result);
    if (!value) return StatsdParse::Malformed;
    result.values.push_back(*value);
  } while (!values.empty());
  const bool isGauge = result.kind == StatsdKind::Gauge || result.kind == StatsdKind::GaugeDelta;
  return isGauge && result.values.size() > 1 ? StatsdParse::Malformed : StatsdParse::Good;
}

}  // namespace tavrel
