// What the submission service notes about a log, beside the log itself.
#pragma once

#include <string>
#include <string_view>

#include "base/bytes.h"
#include "base/expected.h"

namespace tavrel::fleet {

struct LogMetadata {
  std::string logType;  // "193" for tallied logs; empty when unknown
  std::string osVersion;
  std::string previousOsVersion;
  std::string configNumber;
};

/// Why a log with this metadata is refused: "the OS version is not UTF-8"; empty when it is not.
std::string faultOf(const LogMetadata& metadata);

/// Reads NAME.metadata.plist as a device writes it. Fields that are missing or mistyped stay empty.
/// Metadata with a fault is an error.
Expected<LogMetadata> readMetadataFile(ByteSpan document);

/// Reads the value of the header `Tavrel-Options`, "KEY=VALUE&KEY=VALUE" with %XX, into the fields.
void readOptions(std::string_view options, LogMetadata& metadata);

/// Replaces each `%XX` with the byte that it stands for.
std::string percentDecoded(std::string_view text);

/// Whether a log named "NAME-STAMP-DIGITS.log" is of a kind that is not read, according to its
/// metadata or, without any, its name.
bool isOtherLog(std::string_view fileName, const LogMetadata* metadata);

}  // namespace tavrel::fleet
