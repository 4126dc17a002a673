// The exception that services of the platform raise.
//
// Services answer failures in their results. This kind is for what has no place in a result; who
// guards a piece of work against its services catches it and no other.
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
