// Reads submitted logs: XML or binary property lists, plain or compressed with gzip.
//
//   LogReader reader;
//   auto record = reader.read(bytes, &metadata);
//   if (!record) std::cerr << path << ": " << record.error().message;
#pragma once

#include <string>

#include "base/bytes.h"
#include "base/expected.h"
#include "fleet/logs/expat_xml.h"
#include "fleet/logs/log_metadata.h"
#include "fleet/model/log_record.h"

namespace tavrel::fleet {

/// One object reads one log after another, in one thread.
class LogReader {
 public:
  /// The error is why the log is refused: one line, without the file's name. Without metadata,
  /// the versions are unknown.
  Expected<LogRecord> read(ByteSpan bytes, const LogMetadata* metadata);
  /// The size of the last log, expanded unless that failed.
  std::size_t documentBytes() const { return documentBytes_; }

 private:
  std::string readDocument(ByteSpan document, LogRecord& record);

  ExpatXml xml_;
  std::string expanded_;
  std::size_t documentBytes_ = 0;
  // Row counts of the last log, to reserve as much for the next one.
  std::size_t scalars_ = 0;
  std::size_t distributions_ = 0;
  std::size_t cells_ = 0;
};

}  // namespace tavrel::fleet
