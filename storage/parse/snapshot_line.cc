#include "storage/parse/snapshot_line.h"

#include <algorithm>

namespace tavrel {
namespace {

// The numbers at one position in all triples of a field.
struct LatencyRun {
  const char* name;  // argument of the field's format
  FormatOf<std::uint32_t> first;
  FormatOf<std::uint32_t> further;
};

constexpr LatencyRun kLatencyRuns[] = {
    {"O", "%4u", "/%4u"},  // operations
    {"L", "%7u", "/%7u"},  // total latency
    {"M", "%5u", "/%5u"},  // maximum
};

// The descriptor has been checked, so every field lies in the buffer.
std::uint32_t wordAt(ByteSpan record, std::uint64_t offset) {
  return *loadLittle32(record, offset);
}

}  // namespace

bool SnapshotWriter::write(std::string_view piece) {
  if (rest_.empty()) return false;
  const bool fits = piece.size() < rest_.size();
  const auto end =
      std::copy_n(piece.begin(), std::min(piece.size(), rest_.size() - 1), rest_.begin());
  *end = '\0';
  if (fits) rest_ = rest_.subspan(piece.size());
  return fits;
}

bool SnapshotWriter::writeLine(std::span<const SnapshotField> fields, ByteSpan record) {
  for (const SnapshotField& field : fields) {
    if (!writeField(field, record)) return false;
  }
  return write("\n");
}

bool SnapshotWriter::writeField(const SnapshotField& field, ByteSpan record) {
  switch (field.kind) {
    case SnapshotFieldKind::Number: {
      const FormatArgument arguments[] = {wordAt(record, field.offset)};
      return print(field, arguments);
    }
    case SnapshotFieldKind::Microseconds: {
      const std::uint32_t microseconds = wordAt(record, field.offset);
      const FormatArgument arguments[] = {microseconds / 1000, microseconds % 1000 / 10};
      return print(field, arguments);
    }
    case SnapshotFieldKind::Latencies:
      return writeLatencies(field, record);
  }
  return false;
}

bool SnapshotWriter::writeLatencies(const SnapshotField& field, ByteSpan record) {
  std::uint64_t offsetOfRun = field.offset;
  for (const LatencyRun& run : kLatencyRuns) {
    const FormatArgument name[] = {run.name};
    if (!print(field, name)) return false;
    for (std::uint64_t i = 0; i < field.triples; ++i) {
      piece_.clear();
      appendFormat(piece_, i == 0 ? run.first : run.further,
                   wordAt(record, offsetOfRun + i * kLatencyTripleBytes));
      if (!write(piece_)) return false;
    }
    offsetOfRun += 4;
  }
  return true;
}

bool SnapshotWriter::print(const SnapshotField& field, std::span<const FormatArgument> given) {
  piece_.clear();
  return appendForeignFormat(piece_, field.format, given.first(field.arguments)) && write(piece_);
}

}  // namespace tavrel
