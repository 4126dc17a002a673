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

bool parseFinite(std::string_view text, double& number) {
  if (text.starts_with('+')) {
    text.remove_prefix(1);
    if (text.starts_with('-')) return false;
  }
  const auto value = parseNumber<double>(text);
  if (!value || !std::isfinite(*value)) return false;
  number = *value;
  return true;
}

// Whether a value of the line can be added to a scalar, or set.
bool isInRange(const StatsdLine& line, double value) {
  if (line.kind == StatsdKind::Series) return true;
  if (line.kind == StatsdKind::Counter) value /= line.rate;
  return value >= -0x1p63 && value < 0x1p63;
}

bool parseRate(std::string_view text, double& rate) {
  return parseFinite(text, rate) && rate > 0 && rate <= 1;
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
    double value = 0;
    if (!parseFinite(takeUntil(values, ':'), value) || !isInRange(result, value))
      return StatsdParse::Malformed;
    result.values.push_back(value);
  } while (!values.empty());
  const bool isGauge = result.kind == StatsdKind::Gauge || result.kind == StatsdKind::GaugeDelta;
  return isGauge && result.values.size() > 1 ? StatsdParse::Malformed : StatsdParse::Good;
}

}  // namespace tavrel
