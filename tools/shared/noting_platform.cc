#include "tools/shared/noting_platform.h"

namespace tavrel {

void NotingStreams::writeOutput(std::string_view text) {
  while (text.ends_with('\n'))
    text.remove_suffix(1);
  if (text.empty()) return;
  hasPrinted_ = true;
  context_.note(text);
}

NotingPlatform::NotingPlatform(ToolContext& context)
    : context_(context), streams_(context), platform_(context.platform()) {
  platform_.standardStreams = streams_;
}

}  // namespace tavrel
