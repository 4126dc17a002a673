// The sections of a device's page. Each writes what it knows and says what it left out.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <vector>

#include "base/plist.h"
#include "page/document.h"
#include "tools/check/check.h"
#include "tools/page/recorded_days.h"
#include "tools/shared/distribution_view.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// The log of the day that is shown, as it would leave the device.
struct PageLog {
  std::string reason;         // why there is none; empty when there is one
  plist::Dictionary scalars;  // an empty handle without a log
  std::vector<DistributionView> distributions;
  bool isCovered = false;           // by the owner's permission
  std::vector<std::string> errors;  // that occurred while it was made
};

/// What all sections share.
struct PageScene {
  ToolContext& context;
  page::Document& document;
  const RecordedDays& recorded;
  const PageLog& log;
  std::string osVersion;
};

/// How much a section may hold, so that a page stays below 2 MB whatever the device contains.
struct SectionLimit {
  std::size_t items;
  std::size_t bytes;

  bool isReached(std::size_t written, const page::HtmlWriter& html) const {
    return written >= items || html.written().size() >= bytes;
  }
};

void writeHead(PageScene& scene, const std::vector<Check>& checks);
void writeHealth(PageScene& scene, const std::vector<Check>& checks);
void writeScalars(PageScene& scene);
void writeDistributions(PageScene& scene);
void writeTrends(PageScene& scene);
/// Channels that measure how long states lasted.
void writeStates(PageScene& scene);
void writeDrives(PageScene& scene);
void writeNotes(PageScene& scene);

// -- Helpers for several sections -----------------------------------------------------------------

/// Writes a key with its meaning below it, as the heading of a row.
void writeKey(page::HtmlWriter& html, std::string_view key);
/// Begins a card with a heading. The caller must end it. A long key gets a wide card.
void beginCard(page::HtmlWriter& html, std::string_view key);
/// Writes one fact of a list, with outside text; `style` is "good", "warn", "bad" or empty.
void writeFact(page::HtmlWriter& html, std::string_view term, std::string_view text,
               std::string_view style = {});
/// Says that `count` of `what`, given in the singular, appear only in the output of the command
/// `where`. Writes nothing for 0.
void writeLeftOut(page::HtmlWriter& html, std::uint64_t count, std::string_view what,
                  std::string_view where);

}  // namespace tavrel
