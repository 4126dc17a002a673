// Import lines, split into blocks at a position that the first byte chooses. Wherever the stream is
// split, the same lines must come out and the same line must be refused; lines that are read and
// written again must read back the same, bit by bit.
#include <bit>
#include <cstdint>
#include <cstdlib>
#include <string>

#include "tools/stat/import_lines.h"

using namespace tavrel;

namespace {

std::string written(const ImportLine& line) {
  std::string text;
  if (line.kind == ImportLine::Kind::Scalar) {
    appendScalarLine(text, line.day, line.key, line.integer);
  } else {
    appendValueLine(text, line.day, line.key, line.seconds, line.value);
  }
  return text;
}

// All lines in export form, then the number of lines and the reason why reading ended.
std::string readIn(std::string_view stream, std::size_t block) {
  std::string out;
  ImportParser parser(0);
  const ImportParser::Sink sink = [&](const ImportLine& line) -> Status {
    if (!isExportable(line.key)) std::abort();
    const std::string text = written(line);
    const auto again = parseImportLine(std::string_view(text).substr(0, text.size() - 1), 0);
    if (!again || again->kind != line.kind || again->day != line.day || again->key != line.key ||
        again->integer != line.integer || again->seconds != line.seconds ||
        std::bit_cast<std::uint64_t>(again->value) != std::bit_cast<std::uint64_t>(line.value)) {
      std::abort();
    }
    out += text;
    return Done{};
  };
  Status read = Done{};
  for (; read && !stream.empty(); stream.remove_prefix(std::min(block, stream.size()))) {
    read = parser.feed(stream.substr(0, block), sink);
  }
  if (read) read = parser.finish(sink);
  return out + std::to_string(parser.lines()) + (read ? "" : read.error().message);
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  if (size == 0) return 0;
  const std::string_view stream(reinterpret_cast<const char*>(data + 1), size - 1);
  if (readIn(stream, stream.size() + 1) != readIn(stream, std::size_t{data[0]} + 1)) std::abort();
  return 0;
}
