// Shows a tallied log to people and programs.
#pragma once

#include <string>

#include "base/plist.h"
#include "tools/console/tool_output.h"

namespace tavrel {

/// A log's surroundings: its place, and the metadata of the submission service.
struct LogEnvelope {
  /// "pending", "outbox", "withheld", "refused", "preview" or "file"
  std::string place;
  std::string path;  // empty for a preview
  plist::Dictionary metadata;
};

/// Prints a table: header, metadata, scalars, distributions, histograms as bars, and whatever does
/// not belong in a tallied log. `document` is the log when it is a property list.
void printLog(const Page& page, const LogEnvelope& envelope, const plist::Dictionary& document);

/// The same facts as JSON. The standard deviation is that of the population: the root of the sum of
/// squared deviations divided by the count.
Json jsonOfLog(const LogEnvelope& envelope, const plist::Dictionary& document);

/// The lines about a log's surroundings, also printed above logs in other formats.
void printEnvelope(const Page& page, const LogEnvelope& envelope);
Json jsonOfEnvelope(const LogEnvelope& envelope);

}  // namespace tavrel
