// The outcome of an operation: a value, or the reason why there is none.
#pragma once

#include <string>
#include <utility>
#include <variant>

namespace tavrel {

/// A reason for people to read: what failed, where, and the system's own error text, if any.
struct Error {
  std::string message;
};

/// Holds a `T` or an `Error`. Test it before taking the value.
template <class T>
class [[nodiscard]] Expected {
 public:
  Expected(T value) : state_(std::in_place_index<0>, std::move(value)) {}
  Expected(Error error) : state_(std::in_place_index<1>, std::move(error)) {}

  explicit operator bool() const { return state_.index() == 0; }

  T& operator*() & { return std::get<0>(state_); }
  const T& operator*() const& { return std::get<0>(state_); }
  T&& operator*() && { return std::get<0>(std::move(state_)); }
  T* operator->() { return &std::get<0>(state_); }
  const T* operator->() const { return &std::get<0>(state_); }

  const Error& error() const { return std::get<1>(state_); }

 private:
  std::variant<T, Error> state_;
};

/// The outcome of an operation without a value.
struct Done {};
using Status = Expected<Done>;

}  // namespace tavrel
