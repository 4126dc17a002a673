// What a fleet's server finds: plain and compressed archives, lines about uploads, and metadata
// beside logs. Each log goes all the way to a record. Whatever arrives, each item must say what
// became of it, nothing may exceed the limits, and texts for tables must be as short as in any log.
//
// Input: a byte that chooses the form, then the bytes of the file.
#include <algorithm>
#include <memory>
#include <zlib.h>

#include "fleet/loading/read_item.h"
#include "fleet/logs/limits.h"
#include "fleet/sources/limits.h"
#include "fleet/sources/sources.h"
#include "memory_tree.h"
#include "support.h"

using namespace tavrel;
using namespace tavrel::fleet;
using fuzz::require;

namespace {

constexpr std::size_t kBlock = 512;
constexpr std::size_t kSumAt = 148;
constexpr std::size_t kSumBytes = 8;

std::string gzipped(std::string_view content) {
  std::string out(content.size() + 1024, '\0');
  z_stream stream{};
  require(deflateInit2(&stream, 1, Z_DEFLATED, MAX_WBITS + 16, 8, Z_DEFAULT_STRATEGY) == Z_OK);
  stream.next_in = reinterpret_cast<Bytef*>(const_cast<char*>(content.data()));
  stream.avail_in = static_cast<uInt>(content.size());
  stream.next_out = reinterpret_cast<Bytef*>(out.data());
  stream.avail_out = static_cast<uInt>(out.size());
  require(deflate(&stream, Z_FINISH) == Z_STREAM_END);
  out.resize(stream.total_out);
  deflateEnd(&stream);
  return out;
}

void checkTexts(const LogMetadata& metadata) {
  require(percentDecoded(metadata.osVersion).size() <= metadata.osVersion.size());
  isOtherLog("log-tallied-20261116T180218Z-0badcafe.log", &metadata);
}

void read(const fuzz::Tree& tree, const std::string& name, const UploadLines& lines) {
  static LogReader reader;
  static const PermittedKeys permitted;
  visitSources(tree.root.path(name), lines, [&](SourceItem found) {
    require(found.name.starts_with(tree.root.path(name)));
    require(found.content.size() <= fleet::limits::kLogBytes);
    if (found.metadata) checkTexts(*found.metadata);
    const ReadItem item = readItem(std::move(found), reader, permitted);
    switch (item.source.kind) {
      case SourceItem::Kind::Refused:
      case SourceItem::Kind::Skipped:
        return require(!item.record && !item.source.reason.empty());
      case SourceItem::Kind::Other:
      case SourceItem::Kind::TooNew:
        return require(!item.record);
      default:
        require(item.record && item.bytes <= fleet::limits::kLogBytes);
        for (const std::string_view text :
             {item.record->osVersion, item.record->previousOsVersion, item.record->configNumber})
          require(text.size() <= fleet::limits::kTextBytes);
    }
  });
}

}  // namespace

// Without correct checksums in their members' headers, archives would be refused at once.
extern "C" std::size_t LLVMFuzzerMutate(std::uint8_t* data, std::size_t size, std::size_t most);
extern "C" std::size_t LLVMFuzzerCustomMutator(std::uint8_t* data, std::size_t size,
                                               std::size_t most, unsigned) {
  size = LLVMFuzzerMutate(data, size, most);
  for (std::size_t at = 1; at + kBlock <= size; at += kBlock) {
    std::uint8_t* const head = data + at;
    if (!std::equal(head + 257, head + 262, "ustar")) continue;
    std::fill_n(head + kSumAt, kSumBytes, std::uint8_t{' '});
    unsigned sum = 0;
    for (std::size_t i = 0; i < kBlock; ++i)
      sum += head[i];
    for (std::size_t digit = 6; digit-- > 0; sum /= 8)
      head[kSumAt + digit] = static_cast<std::uint8_t>('0' + sum % 8);
    head[kSumAt + 6] = 0;
  }
  return size;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  const unsigned form = input.byte();
  fuzz::Tree tree;
  UploadLines lines;
  switch (form % 6) {
    case 0:
      tree.write("/a.tar", input.text());
      read(tree, "/a.tar", lines);
      break;
    case 1:
      tree.write("/a.tgz", gzipped(input.text()));
      read(tree, "/a.tgz", lines);
      break;
    case 2:
    case 3: {
      const std::string text(input.text());
      tree.write("/lines", form % 2 == 0 ? text : gzipped(text));
      const auto useless = lines.read(tree.root.path("/lines"));
      const auto ends = static_cast<std::size_t>(std::ranges::count(text, '\n'));
      if (useless) require(*useless <= ends + 1);
      // The log that the examples describe.
      if (const LogMetadata* const line = lines.find("device", "x.log")) checkTexts(*line);
      tree.write("/device/x.log", R"(<plist><dict/></plist>)");
      read(tree, "/device", lines);
      break;
    }
    case 4: {
      const auto metadata = readMetadataFile(input.bytes());
      if (metadata) checkTexts(*metadata);
      break;
    }
    default:
      // a log, 0xFF, its metadata
      tree.write("/x.log", input.part());
      tree.write("/x.metadata.plist", input.text());
      read(tree, "/x.log", lines);
  }
  return 0;
}
