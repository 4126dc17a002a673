// Starts libcurl, and holds the connection that transfers share.
//
// Each transfer needs its own handle: when one is reused, libcurl 7.88 takes a folded line
// at the beginning of an answer's headers as part of the previous answer's last header,
// which it has already freed.
#pragma once

#include <memory>

namespace tavrel {

/// Must outlive the handles that use it. Throws `std::bad_alloc` when libcurl cannot start.
class CurlShare {
 public:
  CurlShare();
  ~CurlShare();
  CurlShare(const CurlShare&) = delete;
  CurlShare& operator=(const CurlShare&) = delete;

  /// The value for the option CURLOPT_SHARE.
  void* get() const { return share_.get(); }

 private:
  std::unique_ptr<void, void (*)(void*)> share_;
};

}  // namespace tavrel
