// libcurl's start, and the connection that transfers share.
//
// Each transfer has a handle of its own, because libcurl 7.88, used again, takes a folded line at
// the beginning of an answer's headers for part of the last header of the answer before, which it
// has freed.
#pragma once

#include <memory>

namespace tavrel {

/// Outlives the handles that use it. Throws `std::bad_alloc` when libcurl cannot start.
class CurlShare {
 public:
  CurlShare();
  ~CurlShare();
  CurlShare(const CurlShare&) = delete;
  CurlShare& operator=(const CurlShare&) = delete;

  /// For the option CURLOPT_SHARE.
  void* get() const { return share_.get(); }

 private:
  std::unique_ptr<void, void (*)(void*)> share_;
};

}  // namespace tavrel
