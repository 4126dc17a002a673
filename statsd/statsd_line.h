// Lines of the StatsD protocol: NAME:VALUE|TYPE, then further fields, each after a "|".
//
//   StatsdLine line;
//   if (parseStatsdLine("requests:1|c|@0.1", line) == StatsdParse::Good) use(line);
#pragma once

#include <cstdint>
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

struct StatsdLine {
  /// Not empty, and without tags. Points into the parsed line.
  std::string_view name;
  StatsdKind kind;
  /// One or more, all finite; those of scalars fit 64 bits, also divided by the rate. Gauges have
  /// one.
  std::vector<double> values;
  /// The fraction of all events that the client sent, above 0 and at most 1.
  double rate;
};

/// Parses one line, without its line end. `result` is meaningful only when the outcome is Good.
StatsdParse parseStatsdLine(std::string_view text, StatsdLine& result);

}  // namespace tavrel
