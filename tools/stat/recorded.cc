#include "tools/stat/recorded.h"

#include <utility>

#include "platform/linux/linux_platform.h"
#include "platform/platform.h"

namespace tavrel {

Expected<RecordedHistory> openRecorded(ToolContext& context, RowSelection selection) {
  const Recorders recorders =
      Recorders::read(context.root(), context.linuxPlatform().fileSystem(),
                      context.platform().propertyLists, context.platform().log);
  auto history = RecordedHistory::open(context.root(), context.storeForReading(), recorders,
                                       std::move(selection));
  if (!history) return history;
  for (const std::string& line : history->warnings())
    context.failOnce(line);
  return history;
}

}  // namespace tavrel
