#include "fleet/logs/log_reader.h"

#include <utility>

#include "base/format.h"
#include "fleet/logs/binary_log.h"
#include "fleet/logs/gzip.h"
#include "fleet/logs/limits.h"
#include "fleet/logs/plain_xml.h"
#include "fleet/logs/record_digest.h"

namespace tavrel::fleet {
namespace {

constexpr std::string_view kBinaryBeginning = "bplist";

// Tells documents of other kinds apart, so that they are not reported as malformed XML.
bool looksLikeXml(std::string_view text) {
  if (text.starts_with("\xEF\xBB\xBF")) text.remove_prefix(3);
  const std::size_t first = text.find_first_not_of(" \t\n\r");
  if (first != std::string_view::npos && text[first] == '<') return true;
  // UTF-16, with or without a byte-order mark.
  return text.starts_with("\xFE\xFF") || text.starts_with("\xFF\xFE") ||
         text.starts_with(std::string_view("\0<", 2));
}

}  // namespace

std::string LogReader::readDocument(ByteSpan document, LogRecord& record) {
  const std::string_view text = asText(document);
  if (text.empty()) return "is empty";
  LogBuilder builder(record);
  if (text.starts_with(kBinaryBeginning)) {
    std::string fault = readBinaryLog(document, builder);
    if (!fault.empty()) return fault;
    return builder.finish() ? std::string() : builder.fault();
  }
  if (!looksLikeXml(text)) return "is not a property list";
  switch (readPlainXml(text, builder)) {
    case PlainXml::Read:
      return builder.finish() ? std::string() : builder.fault();
    case PlainXml::Refused:
      return builder.fault();
    case PlainXml::NotPlain:
      break;
  }
  record = {};
  LogBuilder again(record);
  std::string fault = xml_.read(document, again);
  if (!fault.empty()) return fault;
  return again.finish() ? std::string() : again.fault();
}

Expected<LogRecord> LogReader::read(ByteSpan bytes, const LogMetadata* metadata) {
  documentBytes_ = bytes.size();
  if (isGzip(bytes)) {
    if (const Status done = gunzip(bytes, limits::kLogBytes, expanded_); !done) return done.error();
    bytes = asBytes(expanded_);
    documentBytes_ = bytes.size();
  }
  if (bytes.size() > limits::kLogBytes) {
    return Error{format("has more than %zu bytes", limits::kLogBytes)};
  }
  LogRecord record;
  record.scalars.reserve(scalars_);
  record.distributions.reserve(distributions_);
  record.cells.reserve(cells_);
  if (metadata != nullptr) {
    const std::string fault = faultOf(*metadata);
    if (!fault.empty()) return Error{"its metadata: " + fault};
  }
  std::string fault = readDocument(bytes, record);
  if (!fault.empty()) return Error{std::move(fault)};
  scalars_ = record.scalars.size();
  distributions_ = record.distributions.size();
  cells_ = record.cells.size();
  record.digest = digestOf(record);
  if (metadata != nullptr) {
    record.osVersion = record.texts.keep(metadata->osVersion);
    record.previousOsVersion = record.texts.keep(metadata->previousOsVersion);
    record.configNumber = record.texts.keep(metadata->configNumber);
  }
  return record;
}

}  // namespace tavrel::fleet
