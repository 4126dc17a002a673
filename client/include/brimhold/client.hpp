// The C++20 interface of brimhold/client.h, which describes guarantees and costs.
//
//   #include <brimhold/client.hpp>
//   static const brimhold::Scalar starts("com.example.starts");
//   static const brimhold::Distribution duration("com.example.duration");
//   starts.add();
//   duration.record(2.5);
#pragma once

#include <brimhold/client.h>
#include <cstdint>
#include <string>
#include <string_view>

namespace brimhold {

namespace detail {
// The library would take the text only up to a zero in it. An empty key is refused.
inline const char* wholeKey(const std::string& key) {
  return key.find('\0') == std::string::npos ? key.c_str() : "";
}
}  // namespace detail

/// A number per UTC day. Cheap to copy.
class Scalar {
 public:
  explicit Scalar(const char* key) : key_(BHClientScalarForKey(key)) {}
  explicit Scalar(const std::string& key) : Scalar(detail::wholeKey(key)) {}

  void add(std::int64_t amount = 1) const noexcept { BHClientScalarAdd(key_, amount); }
  void set(std::int64_t value) const noexcept { BHClientScalarSet(key_, value); }

 private:
  BHClientScalarKey* key_;
};

/// A series of measurements. Cheap to copy.
class Distribution {
 public:
  explicit Distribution(const char* key) : key_(BHClientDistributionForKey(key)) {}
  explicit Distribution(const std::string& key) : Distribution(detail::wholeKey(key)) {}

  void record(double value) const noexcept { BHClientDistributionRecord(key_, value); }

  BHClientDistributionKey* handle() const noexcept { return key_; }

 private:
  BHClientDistributionKey* key_;
};

/// Records how long its scope took, in seconds.
class ScopedTimer {
 public:
  explicit ScopedTimer(const Distribution& distribution) noexcept : key_(distribution.handle()) {}
  ScopedTimer(const ScopedTimer&) = delete;
  ScopedTimer& operator=(const ScopedTimer&) = delete;
  ~ScopedTimer() { BHClientTimerStopSeconds(timer_, key_); }

 private:
  BHClientDistributionKey* key_;
  BHClientTimer timer_ = BHClientTimerStart();
};

/// The sentence of `BHClientGetStatus`; empty when all is well. Not empty, although values are
/// kept, when a key was refused or the process cannot ask for folds.
inline std::string_view whyNotRecording() noexcept {
  const char* text = nullptr;
  return BHClientGetStatus(&text) == BHClientStatusRecording ? std::string_view() : text;
}

}  // namespace brimhold
