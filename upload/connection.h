// The way to the server: HTTP/1.1 over TLS, by libcurl. One connection serves all logs.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "http/curl_share.h"
#include "upload/configuration.h"

namespace tavrel::upload {

/// The names of the header that a log's digest goes out in, and of the one that it comes back in.
inline constexpr const char* kDigestHeader = "Content-Digest";
inline constexpr const char* kReceivedHeader = "Tavrel-Received";

/// What the server says, once its answer is complete.
struct Answer {
  long status = 0;
  std::string received;         // the header that tells that a log has arrived; empty without it
  std::string location;         // where a redirect points
  std::int64_t retryAfter = 0;  // seconds; 0 when the server does not say
};

class Connection {
 public:
  /// Borrows `configuration`.
  explicit Connection(const Configuration& configuration);

  /// Asked about once a second while a log is sent; false ends the transfer.
  using GoOn = std::function<bool()>;

  /// Puts `body` at `url`, in at most `longest`. An error when there is no whole answer: the server
  /// may have the log or not.
  Expected<Answer> put(const std::string& url, const std::vector<std::string>& headers,
                       std::string_view body, std::chrono::milliseconds longest, const GoOn& goOn);

  /// Whether the last error was about the device's own certificate, key or authorities, which no
  /// later attempt cures.
  bool isMisconfigured() const { return isMisconfigured_; }

 private:
  struct Transfer;
  using Handle = std::unique_ptr<void, void (*)(void*)>;
  Handle newHandle() const;

  const Configuration& configuration_;
  CurlShare shared_;
  bool isMisconfigured_ = false;
};

}  // namespace tavrel::upload
