// One field of a snapshot record: the location of its value and how to print it.
#pragma once

#include <cstddef>
#include <cstdint>
#include <optional>
#include <string_view>

#include "base/format_directive.h"

namespace tavrel {

enum class SnapshotFieldKind : std::uint8_t {
  Number,        // one word: the format applied to it
  Microseconds,  // one word: the format applied to its milliseconds and to hundredths of one
  Latencies,     // triples of words {operations, total latency, maximum}: three runs of numbers
};

inline constexpr std::size_t kLatencyTripleBytes = 12;

struct SnapshotField {
  SnapshotFieldKind kind;
  std::uint32_t offset;   // of its value in a record, in bytes
  std::uint32_t triples;  // of latencies
  std::string_view format;
  std::size_t arguments;  // how many of its kind's arguments the format takes

  /// How many bytes of a record are read from `offset` on.
  constexpr std::uint64_t bytesRead() const {
    return kind == SnapshotFieldKind::Latencies ? std::uint64_t{triples} * kLatencyTripleBytes : 4;
  }
};

/// How many arguments a format takes. Nothing when it takes more than `given`, other types than
/// `type`, or a width from an argument, which no field provides.
constexpr std::optional<std::size_t> argumentsTaken(std::string_view format, ArgumentType type,
                                                    std::size_t given) {
  std::size_t taken = 0;
  for (std::size_t percent = format.find('%'); percent != std::string_view::npos;
       percent = format.find('%')) {
    format.remove_prefix(percent + 1);
    const auto directive = takeDirective(format);
    if (!directive || directive->widthFromArgument || directive->precisionFromArgument) {
      return std::nullopt;
    }
    if (directive->conversion == '%') continue;
    if (taken == given || !accepts(*directive, type)) return std::nullopt;
    ++taken;
  }
  return taken;
}

/// The field, or nothing when its format needs arguments that its kind does not provide. Borrows
/// the format. `size` is that of the latencies, in bytes; an incomplete last triple is ignored.
constexpr std::optional<SnapshotField> makeSnapshotField(SnapshotFieldKind kind,
                                                         std::uint32_t offset, std::uint32_t size,
                                                         std::string_view format) {
  const bool givesText = kind == SnapshotFieldKind::Latencies;
  const std::size_t given = kind == SnapshotFieldKind::Microseconds ? 2 : 1;
  const auto arguments =
      argumentsTaken(format, givesText ? ArgumentType::Text : ArgumentType::Int, given);
  if (!arguments) return std::nullopt;
  const auto triples = static_cast<std::uint32_t>(givesText ? size / kLatencyTripleBytes : 0);
  return SnapshotField{kind, offset, triples, format, *arguments};
}

}  // namespace tavrel
