#include "tools/export/metric_page.h"

#include <cmath>

#include "base/ascii.h"
#include "base/bytes.h"
#include "base/text.h"
#include "base/utf8.h"
#include "platform/linux/files/digests.h"

namespace tavrel {
namespace {

void appendEscaped(std::string& out, std::string_view bytes) {
  for (const char byte : bytes) {
    out += '%';
    appendHexByte(out, byte);
  }
}

std::string numberOf(double value) {
  if (std::isnan(value)) return "NaN";
  if (std::isinf(value)) return value < 0 ? "-Inf" : "+Inf";
  return numberText(value);
}

// The labels without their braces.
std::string textOf(const MetricLabels& labels) {
  std::string text;
  for (const auto& [name, value] : labels) {
    if (!text.empty()) text += ',';
    text += name;
    text += "=\"";
    for (const char character : labelValue(value)) {
      if (character == '\\' || character == '"') text += '\\';
      text += character;
    }
    text += '"';
  }
  return text;
}

std::string line(std::string_view name, std::string_view labels, std::string_view value,
                 std::string_view furtherLabel = {}) {
  std::string text(name);
  if (!labels.empty() || !furtherLabel.empty()) {
    text += '{';
    text += labels;
    if (!labels.empty() && !furtherLabel.empty()) text += ',';
    text += furtherLabel;
    text += '}';
  }
  text += ' ';
  text += value;
  text += '\n';
  return text;
}

}  // namespace

std::string boundOf(double value) {
  std::string text = numberOf(value);
  if (text.find_first_of(".eIN") == std::string::npos) text += ".0";
  return text;
}

std::string labelValue(std::string_view bytes) {
  constexpr std::string_view kCutMark = "%~";
  constexpr std::size_t kDigestBytes = 8;
  constexpr std::size_t kLongestEscape = 6;
  std::string value;
  for (std::string_view rest = bytes; !rest.empty();) {
    if (value.size() > kLongestLabel - kLongestEscape - kCutMark.size() - 2 * kDigestBytes &&
        (value.size() + rest.size() > kLongestLabel)) {
      value += kCutMark;
      appendHex(value, ByteSpan(sha256(asBytes(bytes))).first(kDigestBytes));
      return value;
    }
    const std::string_view before = rest;
    const char32_t point = takeCodePoint(rest);
    const std::string_view taken = before.substr(0, before.size() - rest.size());
    const bool isMalformed = point == kReplacementCharacter && taken.size() == 1;
    if (point < 0x20 || (point >= 0x7F && point < 0xA0) || point == '%' || isMalformed) {
      appendEscaped(value, taken);
    } else {
      value += taken;
    }
  }
  return value;
}

template <class Write>
void MetricPage::add(const MetricFamily& family, std::string_view type, const MetricLabels& labels,
                     const Write& write) {
  Family& added =
      families_.try_emplace(family.name, Family{type, family.unit, family.help, {}}).first->second;
  if (added.metrics.size() >= kMetrics) return void(++leftOut_);
  const auto [metric, isNew] = added.metrics.try_emplace(textOf(labels));
  if (!isNew) return void(++leftOut_);
  metric->second = write(metric->first);
}

void MetricPage::gauge(const MetricFamily& family, const MetricLabels& labels, double value) {
  add(family, "gauge", labels,
      [&](const std::string& text) { return line(family.name, text, numberOf(value)); });
}

void MetricPage::gauge(const MetricFamily& family, const MetricLabels& labels, std::int64_t value) {
  add(family, "gauge", labels,
      [&](const std::string& text) { return line(family.name, text, std::to_string(value)); });
}

void MetricPage::summary(const MetricFamily& family, const MetricLabels& labels,
                         const SummaryPoint& point) {
  add(family, "summary", labels, [&](const std::string& text) {
    std::string lines;
    for (const auto& [quantile, value] : point.quantiles) {
      lines += line(family.name, text, numberOf(value), "quantile=\"" + boundOf(quantile) + "\"");
    }
    lines += line(family.name + "_sum", text, numberOf(point.sum));
    lines += line(family.name + "_count", text, std::to_string(point.count));
    return lines;
  });
}

void MetricPage::histogram(const MetricFamily& family, const MetricLabels& labels,
                           const HistogramPoint& point) {
  if (point.buckets.empty()) return;
  add(family, "histogram", labels, [&](const std::string& text) {
    std::string lines;
    for (const auto& [bound, count] : point.buckets) {
      lines += line(family.name + "_bucket", text, std::to_string(count),
                    "le=\"" + boundOf(bound) + "\"");
    }
    lines += line(family.name + "_sum", text, numberOf(point.sum));
    lines += line(family.name + "_count", text, std::to_string(point.buckets.back().second));
    return lines;
  });
}

std::string MetricPage::text() const {
  std::string page;
  for (const auto& [name, family] : families_) {
    const auto describe = [&, &familyName = name](std::string_view what, std::string_view text) {
      page += "# ";
      page += what;
      page += ' ' + familyName + ' ';
      page += text;
      page += '\n';
    };
    describe("TYPE", family.type);
    if (!family.unit.empty()) describe("UNIT", family.unit);
    describe("HELP", family.help);
    for (const auto& [labels, lines] : family.metrics)
      page += lines;
  }
  return page + "# EOF\n";
}

}  // namespace tavrel
