#include "upload/connection.h"

#include <algorithm>
#include <curl/curl.h>
#include <memory>
#include <new>
#include <utility>

#include "base/limits.h"
#include "base/version.h"
#include "http/curl_handle.h"

namespace tavrel::upload {
namespace {

// bytes a second, below which a transfer counts as stalled
constexpr long kSlowest = 100;

constexpr const char* kDistrustAdvice =
    ": check the URL, the clock, and tavrel-upload.authority in CREDENTIALS_DIRECTORY";

void setText(CURL* handle, CURLoption option, const std::string& text) {
  if (!text.empty()) setOption(handle, option, text.c_str());
}

std::string headerOf(CURL* handle, const char* name) {
  curl_header* header = nullptr;
  if (curl_easy_header(handle, name, 0, CURLH_HEADER, -1, &header) != CURLHE_OK) return {};
  return header->value;
}

CurlHandle newHandle(const CurlShare& share, const Configuration& configuration) {
  CurlHandle owned = newCurlHandle(share, configuration.mayBePlain ? "https,http" : "https",
                                   configuration.authority);
  CURL* const handle = owned.get();
  // Do not wait for a name look-up that hangs.
  setOption(handle, CURLOPT_QUICK_EXIT, 1L);
  setText(handle, CURLOPT_SSLCERT, configuration.certificate);
  setText(handle, CURLOPT_SSLKEY, configuration.key);
  setOption(handle, CURLOPT_KEYPASSWD, "");  // do not ask for it on a terminal
  setOption(handle, CURLOPT_CONNECTTIMEOUT, static_cast<long>(configuration.connect.count()));
  setOption(handle, CURLOPT_LOW_SPEED_LIMIT, kSlowest);
  setOption(handle, CURLOPT_LOW_SPEED_TIME, static_cast<long>(configuration.stall.count()));
  setOption(handle, CURLOPT_USERAGENT, ("tavrel-upload/" + std::string(version())).c_str());
  return owned;
}

}  // namespace

// The data that the callbacks of one transfer share.
struct Connection::Transfer {
  const GoOn& goOn;
  std::chrono::steady_clock::time_point asked;
  std::size_t answerBytes = 0;

  static std::size_t takeBody(char*, std::size_t size, std::size_t count, void* context) {
    Transfer& transfer = *static_cast<Transfer*>(context);
    transfer.answerBytes += size * count;
    return transfer.answerBytes <= limits::kUploadAnswerBytes ? size * count : 0;
  }

  static int progress(void* context, curl_off_t, curl_off_t, curl_off_t, curl_off_t) {
    Transfer& transfer = *static_cast<Transfer*>(context);
    const auto now = std::chrono::steady_clock::now();
    if (now - transfer.asked < std::chrono::seconds(1)) return 0;
    transfer.asked = now;
    return transfer.goOn() ? 0 : 1;
  }
};

Connection::Connection(const Configuration& configuration) : configuration_(configuration) {}

Expected<Answer> Connection::put(const std::string& url, const std::vector<std::string>& headers,
                                 std::string_view body, std::chrono::milliseconds longest,
                                 const GoOn& goOn) {
  // To libcurl, 0 means that there is no limit.
  if (longest <= std::chrono::milliseconds(0)) return Error{"no time is left"};
  std::unique_ptr<curl_slist, void (*)(curl_slist*)> list(nullptr, curl_slist_free_all);
  const auto add = [&](const std::string& header) {
    curl_slist* const longer = curl_slist_append(list.get(), header.c_str());
    if (longer == nullptr) throw std::bad_alloc();
    if (!list) list.reset(longer);
  };
  add("Content-Type: application/octet-stream");
  add("Content-Encoding: gzip");
  if (!configuration_.token.empty()) add("Authorization: Bearer " + configuration_.token);
  for (const std::string& header : headers)
    add(header);

  Transfer transfer{goOn, std::chrono::steady_clock::now()};
  CurlErrorText words{};
  const CurlHandle owned = newHandle(shared_, configuration_);
  CURL* const handle = owned.get();
  setOption(handle, CURLOPT_URL, url.c_str());
  setOption(handle, CURLOPT_CUSTOMREQUEST, "PUT");
  setOption(handle, CURLOPT_HTTPHEADER, list.get());
  setOption(handle, CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(body.size()));
  setOption(handle, CURLOPT_POSTFIELDS, body.data());
  setOption(handle, CURLOPT_TIMEOUT_MS, static_cast<long>(longest.count()));
  setOption(handle, CURLOPT_WRITEFUNCTION, Transfer::takeBody);
  setOption(handle, CURLOPT_WRITEDATA, &transfer);
  setOption(handle, CURLOPT_XFERINFOFUNCTION, Transfer::progress);
  setOption(handle, CURLOPT_XFERINFODATA, &transfer);
  setOption(handle, CURLOPT_NOPROGRESS, 0L);
  setOption(handle, CURLOPT_ERRORBUFFER, words.data());
  const CURLcode code = curl_easy_perform(handle);
  isMisconfigured_ = code == CURLE_SSL_CERTPROBLEM || code == CURLE_SSL_CACERT_BADFILE;
  if (transfer.answerBytes > limits::kUploadAnswerBytes) return Error{"the answer is too long"};
  if (code != CURLE_OK) {
    std::string why = curlFailure(code, words);
    if (code == CURLE_PEER_FAILED_VERIFICATION) why += kDistrustAdvice;
    return Error{std::move(why)};
  }

  Answer answer;
  curl_off_t seconds = 0;
  const char* location = nullptr;
  long status = 0;
  curl_easy_getinfo(handle, CURLINFO_RESPONSE_CODE, &status);
  answer.status = static_cast<int>(status);
  if (curl_easy_getinfo(handle, CURLINFO_RETRY_AFTER, &seconds) == CURLE_OK)
    answer.retryAfter = std::clamp<curl_off_t>(seconds, 0, limits::kLongestUploadPauseSeconds);
  if (curl_easy_getinfo(handle, CURLINFO_REDIRECT_URL, &location) == CURLE_OK && location)
    answer.location = location;
  answer.received = headerOf(handle, kReceivedHeader);
  return answer;
}

}  // namespace tavrel::upload
