// Input to tavrelctl: JSON, values on the command line, structured records, statistics buffers to
// build, logs to show. Whatever JSON can hold must read back from it, a buffer that was built
// without raw bytes, counts or keys above the largest must parse, and a record file must give the
// same lines whether it grows or is complete from the start.
//
// Input: a byte that chooses the reader, then the text.
#include <nlohmann/json.hpp>
#include <sstream>

#include "memory_tree.h"
#include "platform/linux/logs/log_day.h"
#include "platform/plist/coding.h"
#include "platform/plist/encodable_text.h"
#include "storage/parse/asp_parser.h"
#include "support.h"
#include "tools/console/json_value.h"
#include "tools/console/typed_value.h"
#include "tools/log/log_document.h"
#include "tools/nand/nand_build.h"
#include "tools/records/record_reader.h"

using namespace tavrel;
using fuzz::require;

namespace {

void requireSameFromJson(const plist::Value& value) {
  const std::string text = jsonOf(value).dump(-1, ' ', false, Json::error_handler_t::replace);
  const auto again = parseJsonValue(text);
  require(again && jsonOf(*again).dump() == text);
}

void readJson(std::string_view text) {
  const auto value = parseJsonValue(text);
  if (!value) return require(!value.error().message.empty());
  requireSameFromJson(*value);
  if (const auto bytes = plist::PlistCoding().encodeXml(*value)) {
    const auto again = plist::read(asBytes(*bytes));
    require(static_cast<bool>(again));
  }
  hasXmlTextsOnly(*value);
}

void readArgument(std::string_view text, unsigned kind) {
  const auto value = parseArgument(text, static_cast<ArgumentKind>(kind % 5));
  if (!value) return require(!value.error().message.empty());
  if (plist::isEncodable(text, plist::Alphabet::Xml)) requireSameFromJson(*value);
}

void readRecords(std::string_view text, std::size_t first) {
  fuzz::Tree tree;
  const std::string path = tree.root.path("/records");
  std::string lines[2];
  // Read it once as a whole, and once as it grows.
  tree.write("/records", text);
  RecordReader whole(path);
  require(static_cast<bool>(whole.read(true, [&](std::string_view line, std::uint64_t number) {
    lines[0] += std::to_string(number).append(line).append("\n");
    if (const auto record = parseRecord(line)) recordText(record->content);
  })));
  RecordReader growing(path);
  for (const std::string_view part : {text.substr(0, first), text}) {
    tree.write("/records", part);
    require(static_cast<bool>(
        growing.read(part == text, [&](std::string_view line, std::uint64_t number) {
          lines[1] += std::to_string(number).append(line).append("\n");
        })));
  }
  require(lines[0] == lines[1]);
  require(static_cast<bool>(growing.wholeness()) == static_cast<bool>(whole.wholeness()));
}

/// Whether the buffer built from a document must parse: it has a record, and no entry can make a
/// wrong one.
bool makesGoodRecords(const plist::Value& document) {
  constexpr std::int64_t kLargestKey = 0x30000000;
  const plist::Array entries = document.dictionary().array("entries");
  for (std::size_t i = 0; i < entries.size(); ++i) {
    const plist::Value entry = entries.at(i);
    const plist::Dictionary record = entry.dictionary();
    if (record && (record.contains("hex") || record.contains("count"))) return false;
    const plist::Value key = record ? record.get("key") : entry.array().at(0);
    const auto number = key.number();
    if (number && number->int64() > kLargestKey) return false;
  }
  return !entries.empty();
}

void build(std::string_view text) {
  const auto document = parseJsonValue(text);
  if (!document) return;
  const auto buffer = buildStatistics(*document);
  if (!buffer) return require(!buffer.error().message.empty());
  ASPContext context;
  const int parsed = ASPParseBufferToCxt(context, asBytes(*buffer));
  ASPReleaseContext(context);
  require(parsed == 1 || !makesGoodRecords(*document));
}

void showLog(ByteSpan bytes) {
  const auto document = plist::read(bytes);
  if (!document) return;
  std::ostringstream out;
  const LogEnvelope envelope{"file", "x.log", document->dictionary().dictionary("BHMetadata")};
  printLog({out}, envelope, document->dictionary());
  jsonOfLog(envelope, document->dictionary()).dump(-1, ' ', false, Json::error_handler_t::replace);
  dayOfLog(document->dictionary());
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  const unsigned choice = input.byte();
  switch (choice % 6) {
    case 0:
      readJson(input.text());
      break;
    case 1:
      readArgument(input.text(), choice / 6);
      break;
    case 2:
      readRecords(input.text(), choice / 6);
      break;
    case 3:
      build(input.text());
      break;
    case 4:
      showLog(input.bytes());
      break;
    default:
      if (const auto value = plist::read(input.bytes())) requireSameFromJson(*value);
  }
  return 0;
}
