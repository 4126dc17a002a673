// The exception that platform services throw.
//
// Services report failures in their results. This exception is for failures that have no place in a
// result; code that guards its work against services catches this type and no other.
#pragma once

#include <exception>
#include <string>
#include <utility>

namespace tavrel {

class PlatformException : public std::exception {
 public:
  explicit PlatformException(std::string name) : name_(std::move(name)) {}

  const std::string& name() const noexcept { return name_; }
  const char* what() const noexcept override { return name_.c_str(); }

 private:
  std::string name_;
};

}  // namespace tavrel
