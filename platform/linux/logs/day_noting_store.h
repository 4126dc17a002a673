// A statistics store that remembers the earliest day whose rows were read. So code that files a log
// made from them knows how old its statistics are, whatever the run claims.
#pragma once

#include <cstdint>
#include <memory>
#include <optional>
#include <utility>

#include "platform/forwarding_store.h"

namespace tavrel {

class DayNotingStore final : public ForwardingStore {
 public:
  /// The store must outlive it, and it must outlive the histories that it returns.
  using ForwardingStore::ForwardingStore;

  /// The earliest day whose rows may have been read since the last call; nothing when none were.
  std::optional<std::int64_t> takeEarliest() { return std::exchange(earliest_, std::nullopt); }

  std::unique_ptr<BHHistory> initWithDefaultPath() override;

 private:
  class History;

  std::optional<std::int64_t> earliest_;
};

}  // namespace tavrel
