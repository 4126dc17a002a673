// Lines of the StatsD protocol: NAME:VALUE|TYPE, then further fields, each after a "|".
//
//   StatsdLine line;
//   if (parseStatsdLine("requests:1|c|@0.1", line) == StatsdParse::Good) use(line);
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>
#include <vector>

namespace tavrel {

enum class StatsdKind : std::uint8_t {
  Counter,     // c
  Gauge,       // g with a plain number
  GaugeDelta,  // g with a sign
  Series,      // ms, h, d
};

enum class StatsdParse : std::uint8_t {
  Good,
  Malformed,
  Unsupported,  // a set, an event or a service check
};

struct StatsdValue {
  /// Finite; that of a scalar fits 64 bits, also divided by the rate.
  double number;
  /// What a scalar's whole number is exactly, where no rate divides it: above 2^53, `number` is
  /// rounded.
  std::optional<std::int64_t> whole;
};

struct StatsdLine {
  /// Not empty, and without tags. Points into the parsed line.
  std::string_view name;
  StatsdKind kind;
  /// One or more; gauges have one.
  std::vector<StatsdValue> values;
  /// The fraction of all events that the client sent, above 0 and at most 1.
  double rate;
};

/// Parses one line, without its line end. `result` is meaningful only when the outcome is Good.
StatsdParse parseStatsdLine(std::string_view text, StatsdLine& result);

}  // namespace tavrel
