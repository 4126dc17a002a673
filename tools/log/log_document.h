// Shows a tallied log to people and programs.
#pragma once

#include <cstdint>
#include <optional>
#include <string>
#include <utility>
#include <vector>

#include "base/plist.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// What surrounds a log: its place, and the submission service's metadata.
struct LogEnvelope {
  std::string place;  // "pending", "outbox", "preview" or "file"
  std::string path;   // empty for a preview
  plist::Dictionary metadata;
};

/// The table form: header, metadata, scalars, distributions, histograms as bars, and what is not as
/// a tallied log has it. `document` is the log when it is a property list.
void printLog(const Page& page, const LogEnvelope& envelope, const plist::Dictionary& document);

/// The same facts. The standard deviation is that of the population: the root of the sum of squared
/// deviations divided by the count.
Json jsonOfLog(const LogEnvelope& envelope, const plist::Dictionary& document);

/// The lines of a log's envelope, which also stand before logs of other forms.
void printEnvelope(const Page& page, const LogEnvelope& envelope);
Json jsonOfEnvelope(const LogEnvelope& envelope);

}  // namespace tavrel
