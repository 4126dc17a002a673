// All live services of the machine: the figures of its kernel, as drivers that publish channels.
//
// The files are those below the device root. A root other than "/" shows live services only when it
// has a folder /proc of its own, and then those of its /proc and /sys, which may be links to the
// machine's. A root with /sys alone only stands in for a few facts about the hardware. The services
// are discovered on the first request; devices that appear later are found by the next process.
#pragma once

#include <memory>

#include "platform/linux/files/device_root.h"
#include "platform/linux/recorded/live_services.h"
#include "platform/system_log.h"

namespace tavrel {

class LiveMachine final : public LiveServices {
 public:
  struct Options {
    int oneSensorMilliseconds;
    int allSensorsMilliseconds;
  };

  /// The root and the log must outlive it and its samplings.
  LiveMachine(const DeviceRoot& root, SystemLog& log);
  LiveMachine(const DeviceRoot& root, SystemLog& log, const Options& options);
  ~LiveMachine() override;

  plist::Array services() override;
  std::unique_ptr<LiveSampling> subscribe() override;

 private:
  class State;
  class Sampling;
  State& state();

  const DeviceRoot& root_;
  SystemLog& log_;
  const Options options_;
  std::shared_ptr<State> state_;
};

}  // namespace tavrel
