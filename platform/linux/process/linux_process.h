// The running process, as the kernel knows it.
#pragma once

#include "platform/process.h"

namespace tavrel {

class LinuxProcess final : public Process {
 public:
  std::string name() override;
  std::int32_t identifier() override;
};

}  // namespace tavrel
