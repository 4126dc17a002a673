#include "http/curl_share.h"

#include <curl/curl.h>
#include <new>

namespace tavrel {

CurlShare::CurlShare() : share_(nullptr, [](void* share) { curl_share_cleanup(share); }) {
  if (curl_global_init(CURL_GLOBAL_DEFAULT) != CURLE_OK) throw std::bad_alloc();
  share_.reset(curl_share_init());
  if (!share_ ||
      curl_share_setopt(share_.get(), CURLSHOPT_SHARE, CURL_LOCK_DATA_CONNECT) != CURLSHE_OK) {
    throw std::bad_alloc();
  }
}

CurlShare::~CurlShare() {
  share_.reset();
  curl_global_cleanup();
}

}  // namespace tavrel
