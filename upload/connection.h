// The connection to the server: HTTP/1.1 over TLS with libcurl. One connection serves all logs.
#pragma once

#include <chrono>
#include <cstdint>
#include <functional>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "http/curl_share.h"
#include "upload/configuration.h"

namespace tavrel::upload {

/// The header that sends a log's digest, and the one that returns it.
inline constexpr const char* kDigestHeader = "Content-Digest";
inline constexpr const char* kReceivedHeader = "Tavrel-Received";

/// The server's complete answer.
struct Answer {
  int status = 0;
  std::string received;         // the header that confirms that a log has arrived; empty without it
  std::string location;         // where a redirect points
  std::int64_t retryAfter = 0;  // seconds; 0 when the server does not say
};

class Connection {
 public:
  /// `configuration` must outlive the object.
  explicit Connection(const Configuration& configuration);

  /// Called about once a second while a log is sent; returning false aborts the transfer.
  using GoOn = std::function<bool()>;

  /// Sends `body` to `url` with PUT, in at most `longest`. An error when no complete answer
  /// arrives; the server may or may not have the log then.
  Expected<Answer> put(const std::string& url, const std::vector<std::string>& headers,
                       std::string_view body, std::chrono::milliseconds longest, const GoOn& goOn);

  /// Whether the last error concerned the device's own certificate, key or authorities, so that
  /// further attempts cannot succeed.
  bool isMisconfigured() const { return isMisconfigured_; }

 private:
  struct Transfer;

  const Configuration& configuration_;
  CurlShare shared_;
  bool isMisconfigured_ = false;
};

}  // namespace tavrel::upload
