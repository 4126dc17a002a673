// The storage controller's timeline as text, and stack snapshots given on a command line.
#pragma once

#include <optional>
#include <string>

#include "base/expected.h"
#include "platform/stack_snapshot.h"

namespace tavrel {

/// The whole text of snapshot records, in the fixed layout or as their descriptor defines. The
/// error says why the descriptor was refused, or that the text is too long.
Expected<std::string> renderSnapshots(ByteSpan records, std::optional<ByteSpan> descriptor);

/// Returns the one given snapshot every time. The bytes are borrowed.
class TakenSnapshot final : public StackSnapshots {
 public:
  explicit TakenSnapshot(ByteSpan bytes) : bytes_(bytes) {}
  std::unique_ptr<StackSnapshot> create() override;

 private:
  ByteSpan bytes_;
};

}  // namespace tavrel
