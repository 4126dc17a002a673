// Services whose channels are not recorded but read when the hub is asked to update.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>

#include "base/bytes.h"
#include "base/plist.h"

namespace tavrel {

/// The live channels of one subscription.
class LiveSampling {
 public:
  virtual ~LiveSampling() = default;

  /// Takes a channel in. The size of its group of elements; 0 when no live service has it.
  virtual std::size_t add(std::uint64_t driverID, std::uint64_t channelID) = 0;
  /// Reads all channels again.
  virtual void update() = 0;
  /// Writes the group of channel `index`, by the order of adding, at the beginning of `room`, which
  /// has at least its size. The bytes written; 0 while the channel has no value.
  virtual std::size_t write(std::size_t index, MutableByteSpan room) const = 0;
};

class LiveServices {
 public:
  virtual ~LiveServices() = default;

  /// The services in the form that a recording has. They are found out once.
  virtual plist::Array services() = 0;
  virtual std::unique_ptr<LiveSampling> subscribe() = 0;
};

}  // namespace tavrel
