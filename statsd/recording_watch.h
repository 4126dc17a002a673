// Notices, while datagrams arrive, that what they say is no longer kept.
#pragma once

#include <brimhold/client.h>
#include <chrono>
#include <functional>
#include <string_view>

#include "base/expected.h"

namespace tavrel {

class RecordingWatch {
 public:
  using Ticks = std::chrono::steady_clock::time_point;

  /// `complain` receives why nothing is recorded at present: once, as long as the reason stays.
  explicit RecordingWatch(std::function<void(std::string_view)> complain)
      : complain_(std::move(complain)) {}

  /// An error when nothing will be kept until the program starts again.
  Status look();
  /// The same, but at most once a minute: looking costs more than a datagram.
  Status lookAt(Ticks now);

 private:
  std::function<void(std::string_view)> complain_;
  BHClientStatus last_ = BHClientStatusRecording;
  Ticks next_{};
};

}  // namespace tavrel
