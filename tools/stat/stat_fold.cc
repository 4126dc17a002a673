#include "tools/stat/stat_fold.h"

#include <nlohmann/json.hpp>
#include <ostream>

#include "platform/linux/folding/segment_fold.h"
#include "platform/linux/linux_platform.h"
#include "tools/console/table.h"

namespace tavrel {

void foldStatistics(ToolContext& context) {
  const FoldReport report = context.linuxPlatform().fold().run();
  if (context.json()) {
    context.printJson({{"segments", report.segments},
                       {"scalars", report.scalars},
                       {"values", report.values},
                       {"removed", report.removed},
                       {"waiting", report.waiting},
                       {"dropped", report.dropped},
                       {"refused", report.refused},
                       {"segments_refused", report.segmentsRefused}});
  } else if (!report.hasFolder && !report.failure) {
    context.out() << "nothing to fold: the device has no folder /run/tavrel/stat\n";
  } else if (report.hasFolder && (!report.failure || report.segments > 0)) {
    std::ostream& out = context.out();
    out << counted(report.segments, "segment") << ": " << counted(report.scalars, "scalar") << ", "
        << counted(report.values, "value") << "; " << report.removed << " removed";
    if (report.waiting > 0) out << ", " << report.waiting << " left for the next fold";
    out << '\n';
    if (report.dropped > 0) {
      out << "dropped by programs for lack of space: " << counted(report.dropped, "value") << '\n';
    }
    if (report.refused > 0 || report.segmentsRefused > 0) {
      out << "refused: " << counted(report.refused, "value") << ", "
          << counted(report.segmentsRefused, "file") << '\n';
    }
  }
  if (report.failure) context.fail(*report.failure);
}

}  // namespace tavrel
