// Reads hostile logs. What the fast XML reader accepts, the full reader must read into the same
// record; rows must be sorted, no statistic may come twice, and reading twice must give the same
// record.
#include <algorithm>
#include <cstdint>
#include <cstdlib>
#include <functional>

#include "fleet/logs/expat_xml.h"
#include "fleet/logs/log_reader.h"
#include "fleet/logs/plain_xml.h"
#include "fleet/logs/record_digest.h"

using namespace tavrel;
using namespace tavrel::fleet;

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const ByteSpan bytes = std::as_bytes(std::span(data, size));
  static LogReader reader;
  const auto record = reader.read(bytes, nullptr);
  if (record) {
    const auto isInOrder = [](const auto& rows) {
      return std::ranges::adjacent_find(rows, std::ranges::greater_equal{},
                                        [](const auto& row) { return row.key; }) == rows.end();
    };
    if (!isInOrder(record->scalars) || !isInOrder(record->distributions)) std::abort();
    if (!std::ranges::is_sorted(record->cells, {}, &CellRow::key)) std::abort();
    const auto again = reader.read(bytes, nullptr);
    if (!again || again->digest != record->digest) std::abort();
  } else if (record.error().message.empty() ||
             record.error().message.find('\n') != std::string::npos) {
    // A reason may quote the log, whose line ends the program escapes when it prints the reason.
    if (asText(bytes).find('\n') == std::string_view::npos) std::abort();
  }

  LogRecord plain;
  LogBuilder plainBuilder(plain);
  const PlainXml outcome = readPlainXml(asText(bytes), plainBuilder);
  if (outcome == PlainXml::NotPlain) return 0;
  LogRecord whole;
  LogBuilder wholeBuilder(whole);
  static ExpatXml xml;
  const std::string fault = xml.read(bytes, wholeBuilder);
  if (outcome == PlainXml::Refused) {
    if (fault != plainBuilder.fault()) std::abort();
    return 0;
  }
  if (!fault.empty()) std::abort();
  if (plainBuilder.finish() != wholeBuilder.finish()) std::abort();
  if (plainBuilder.fault() != wholeBuilder.fault()) std::abort();
  if (digestOf(plain) != digestOf(whole)) std::abort();
  return 0;
}
