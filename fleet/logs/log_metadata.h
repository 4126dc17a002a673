// What the submission service says of a log beside it.
#pragma once

#include <string>
#include <string_view>

#include "base/bytes.h"
#include "base/expected.h"

namespace tavrel::fleet {

struct LogMetadata {
  std::string logType;  // "193" of tallied logs; empty when it is not known
  std::string osVersion;
  std::string previousOsVersion;
  std::string configNumber;
};

/// NAME.metadata.plist as a device writes it. What is missing, or has another type, is empty.
Expected<LogMetadata> readMetadataFile(ByteSpan document);

/// The value of the header `Tavrel-Options`, "KEY=VALUE&KEY=VALUE" with %XX, into the fields.
void readOptions(std::string_view options, LogMetadata& metadata);

/// `%XX` as the bytes that they stand for.
std::string percentDecoded(std::string_view text);

/// Whether a log of this file name, "NAME-STAMP-DIGITS.log", is of another kind than those that are
/// read, as its metadata says, or else its name.
bool isOtherLog(std::string_view fileName, const LogMetadata* metadata);

}  // namespace tavrel::fleet
