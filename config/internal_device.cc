#include "config/internal_device.h"

namespace tavrel {

bool BHIsInternalDevice(Platform& platform) {
  auto& answer = platform.state->isInternalDevice;
  if (!answer) answer = platform.deviceAnswers->SQGetBoolAnswer("InternalBuild");
  return *answer;
}

}  // namespace tavrel
