#include "tools/consent/fold_everything.h"

#include <cstdint>
#include <limits>

#include "base/format.h"
#include "platform/linux/folding/segment_fold.h"
#include "platform/linux/linux_platform.h"
#include "tools/console/table.h"

namespace tavrel {

Status foldEverything(ToolContext& context) {
  std::uint64_t before = std::numeric_limits<std::uint64_t>::max();
  while (true) {
    const FoldReport report = context.linuxPlatform().fold().run();
    if (report.failure) return Error{*report.failure};
    if (report.waiting == 0) return Done{};
    if (report.waiting >= before) {
      return Error{counted(report.waiting, "segment") +
                   " cannot be folded now: remove the cause that a line above names, or end the "
                   "programs that record"};
    }
    before = report.waiting;
  }
}

}  // namespace tavrel
