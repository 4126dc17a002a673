// The handle of one transfer with libcurl, and its options.
#pragma once

#include <array>
#include <curl/curl.h>
#include <memory>
#include <string>

#include "http/curl_share.h"

namespace tavrel {

using CurlHandle = std::unique_ptr<CURL, void (*)(CURL*)>;
using CurlErrorText = std::array<char, CURL_ERROR_SIZE>;

/// Throws `std::bad_alloc`, or `std::runtime_error` that names the option.
void checkOption(CURLoption option, CURLcode code);

/// Deadlines and the restriction to TLS are among the options, so none may fail silently.
template <class Argument>
void setOption(CURL* handle, CURLoption option, Argument argument) {
  checkOption(option, curl_easy_setopt(handle, option, argument));
}

/// A handle for HTTP/1.1, without proxies and redirects; `https` means at least TLS 1.2. Trusts the
/// authorities in the file; without one, those of the system.
CurlHandle newCurlHandle(const CurlShare& share, const char* protocols,
                         const std::string& authorityFile);

/// Why a transfer failed; `text` is what libcurl wrote to CURLOPT_ERRORBUFFER.
std::string curlFailure(CURLcode code, const CurlErrorText& text);

}  // namespace tavrel
