#include "http/curl_handle.h"

#include <new>
#include <stdexcept>

namespace tavrel {

void checkOption(CURLoption option, CURLcode code) {
  if (code == CURLE_OUT_OF_MEMORY) throw std::bad_alloc();
  if (code == CURLE_OK) return;
  throw std::runtime_error("libcurl refuses option " + std::to_string(option) + ": " +
                           curl_easy_strerror(code));
}

CurlHandle newCurlHandle(const CurlShare& share, const char* protocols,
                         const std::string& authorityFile) {
  CurlHandle owned(curl_easy_init(), curl_easy_cleanup);
  CURL* const handle = owned.get();
  if (handle == nullptr) throw std::bad_alloc();
  setOption(handle, CURLOPT_SHARE, share.get());
  setOption(handle, CURLOPT_PROTOCOLS_STR, protocols);
  setOption(handle, CURLOPT_HTTP_VERSION, static_cast<long>(CURL_HTTP_VERSION_1_1));
  setOption(handle, CURLOPT_FOLLOWLOCATION, 0L);
  setOption(handle, CURLOPT_PROXY, "");
  setOption(handle, CURLOPT_SSLVERSION, static_cast<long>(CURL_SSLVERSION_TLSv1_2));
  if (!authorityFile.empty()) {
    setOption(handle, CURLOPT_CAINFO, authorityFile.c_str());
    // Do not trust the system's as well.
    setOption(handle, CURLOPT_CAPATH, static_cast<char*>(nullptr));
  }
  return owned;
}

std::string curlFailure(CURLcode code, const CurlErrorText& text) {
  return text[0] != '\0' ? text.data() : curl_easy_strerror(code);
}

}  // namespace tavrel
