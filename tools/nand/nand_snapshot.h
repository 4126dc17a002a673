// The storage controller's timeline as text, and stack snapshots that a command line names.
#pragma once

#include <optional>
#include <string>

#include "base/expected.h"
#include "platform/stack_snapshot.h"

namespace tavrel {

/// The whole text of snapshot records, of the fixed layout or as their descriptor says. The error
/// says why a descriptor was refused.
Expected<std::string> renderSnapshots(ByteSpan records, std::optional<ByteSpan> descriptor);

/// Yields one given snapshot again and again. The bytes are borrowed.
class TakenSnapshot final : public StackSnapshots {
 public:
  explicit TakenSnapshot(ByteSpan bytes) : bytes_(bytes) {}
  std::unique_ptr<StackSnapshot> create() override;

 private:
  ByteSpan bytes_;
};

}  // namespace tavrel
