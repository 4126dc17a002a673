// Services whose channels are not recorded but read at each update of the hub.
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

  /// Adds a channel. Returns the size in bytes of its group of elements; 0 when no live service has
  /// it.
  virtual std::size_t add(std::uint64_t driverID, std::uint64_t channelID) = 0;
  /// Reads all channels again.
  virtual void update() = 0;
  /// Writes the group of channel `index`, in the order of adding, to the beginning of `room`, which
  /// is large enough. Returns the bytes written; 0 while the channel has no value.
  virtual std::size_t write(std::size_t index, MutableByteSpan room) const = 0;
};

class LiveServices {
 public:
  virtual ~LiveServices() = default;

  /// The services in the form of a recording. They are discovered once.
  virtual plist::Array services() = 0;
  virtual std::unique_ptr<LiveSampling> subscribe() = 0;
};

}  // namespace tavrel
