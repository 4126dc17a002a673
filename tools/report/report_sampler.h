// Selected report channels and the connection that samples them.
#pragma once

#include <cstdint>
#include <memory>

#include "base/expected.h"
#include "base/plist.h"
#include "ioreport/ioreport.h"
#include "tools/report/report_selection.h"
#include "tools/shared/noting_platform.h"
#include "tools/shared/tool_context.h"

namespace tavrel {

/// The channels that a command line selects. Notes name drivers that cannot be read.
Expected<plist::Dictionary> selectedChannels(ToolContext& context, NotingPlatform& noting,
                                             const ReportSelection& selection);

class Sampler {
 public:
  enum class NoChannels { AreAFailure, AreFine };

  /// Prints what is wrong when it cannot subscribe.
  Sampler(ToolContext& context, const ReportSelection& selection,
          NoChannels noChannels = NoChannels::AreAFailure);

  explicit operator bool() const { return subscription_ != nullptr; }

  /// An empty handle when it fails, after a message that says why.
  plist::Dictionary sample();

  /// How many subscribed channels have no values, and the likely reason.
  std::int32_t missing(const plist::Dictionary& samples) const;
  const char* reasonForMissing() const;

 private:
  ToolContext& context_;
  NotingPlatform noting_;
  plist::Dictionary subscribed_;
  std::shared_ptr<IOReportSubscription> subscription_;
};

}  // namespace tavrel
