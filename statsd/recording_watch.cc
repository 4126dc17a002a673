#include "statsd/recording_watch.h"

#include <utility>

namespace tavrel {

Status RecordingWatch::look() {
  const char* why = "";
  const BHClientStatus status = BHClientGetStatus(&why);
  if (status == BHClientStatusRemoved) return Error{why};
  const bool isNew = std::exchange(last_, status) != status;
  if (isNew && status != BHClientStatusRecording) complain_(why);
  return Done{};
}

Status RecordingWatch::lookAt(Ticks now) {
  if (now < next_) return Done{};
  next_ = now + std::chrono::minutes(1);
  return look();
}

}  // namespace tavrel
