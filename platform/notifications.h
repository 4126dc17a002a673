// Named system notifications without content.
#pragma once

#include <string_view>

namespace tavrel {

class Notifications {
 public:
  virtual ~Notifications() = default;
  virtual void post(std::string_view name) = 0;
};

}  // namespace tavrel
