// The running process.
#pragma once

#include <cstdint>
#include <string>

namespace tavrel {

class Process {
 public:
  virtual ~Process() = default;
  virtual std::string name() = 0;
  virtual std::int32_t identifier() = 0;
};

}  // namespace tavrel
