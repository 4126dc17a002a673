#include "fleet/engine/clickhouse/server.h"

#include <algorithm>
#include <array>
#include <charconv>
#include <curl/curl.h>
#include <exception>
#include <new>
#include <thread>

#include "base/ascii.h"
#include "http/curl_handle.h"

namespace tavrel::fleet {
namespace {

constexpr std::chrono::milliseconds kFirstPause{250};
constexpr std::chrono::milliseconds kLongestPause{30'000};
constexpr long kConnectSeconds = 10;
constexpr std::size_t kLongestComplaint = 65'536;
constexpr std::size_t kLongestText = 1U << 20;  // of an answer that is no rows
constexpr std::size_t kLongestReason = 300;
constexpr long kReceiveBytes = 512L << 10;
// How much of an answer the server buffers in memory; the rest goes to a file there.
constexpr const char* kAnswerBytes = "33554432";

// Codes of transient conditions: time exceeded, too many queries, network trouble between servers,
// too many parts waiting to be merged, no replica or shard reachable.
constexpr std::array kPassingCodes = {159, 202, 203, 209, 210, 252, 279};

std::string encoded(std::string_view text) {
  char* const out = curl_easy_escape(nullptr, text.data(), static_cast<int>(text.size()));
  if (out == nullptr) throw std::bad_alloc();
  std::string result = out;
  curl_free(out);
  return result;
}

// Whether a failure of libcurl comes from the address or its files and so will not pass.
bool isLasting(CURLcode code) {
  return code == CURLE_SSL_CACERT_BADFILE || code == CURLE_PEER_FAILED_VERIFICATION ||
         code == CURLE_UNSUPPORTED_PROTOCOL || code == CURLE_URL_MALFORMAT;
}

int codeIn(std::string_view answer) {
  // In a cluster, a server reports another server's missing table as a failure to connect.
  if (answer.find("There is no table") != answer.npos) return ServerError::kUnknownTable;
  constexpr std::string_view kPrefix = "Code: ";
  const std::size_t at = answer.find(kPrefix);
  int code = 0;
  if (at != answer.npos) {
    const char* const begin = answer.data() + at + kPrefix.size();
    std::from_chars(begin, answer.data() + answer.size(), code);
  }
  return code;
}

// Extracts the server's sentence from text such as "Code: 60, e.displayText() = DB::Exception:
// Table default.x doesn't exist., e.what() = DB::Exception". Empty when another program answered.
std::string reasonIn(std::string_view answer) {
  constexpr std::string_view kBegin = "Exception: ";
  const std::size_t begin = answer.find(kBegin);
  if (begin == answer.npos) return {};
  answer.remove_prefix(begin + kBegin.size());
  answer = answer.substr(0, answer.find(", e.what()"));
  answer = answer.substr(0, answer.find(" (version "));
  answer = answer.substr(0, answer.find("Stack trace"));
  std::string reason;
  for (const char c : answer.substr(0, kLongestReason))
    reason += static_cast<unsigned char>(c) < ' ' || c == '\x7F' ? ' ' : c;
  while (!reason.empty() && (reason.back() == ' ' || reason.back() == '.'))
    reason.pop_back();
  return reason;
}

CurlHandle newHandle(const CurlShare& share, const ServerAddress& address) {
  CurlHandle owned = newCurlHandle(share, "http,https", address.authorityFile);
  CURL* const handle = owned.get();
  setOption(handle, CURLOPT_NOSIGNAL, 1L);
  if (!address.user.empty()) {
    setOption(handle, CURLOPT_HTTPAUTH, static_cast<long>(CURLAUTH_BASIC));
    setOption(handle, CURLOPT_USERNAME, address.user.c_str());
    setOption(handle, CURLOPT_PASSWORD, address.password.c_str());
  }
  setOption(handle, CURLOPT_CONNECTTIMEOUT, kConnectSeconds);
  setOption(handle, CURLOPT_TIMEOUT, static_cast<long>(address.timeout.count()));
  setOption(handle, CURLOPT_BUFFERSIZE, kReceiveBytes);
  return owned;
}

}  // namespace

// The context of one transfer's callback.
struct Server::Transfer {
  CURL* handle;
  const std::function<void(std::string_view)>& take;
  std::string complaint;
  std::exception_ptr failure;
  bool handedOut = false;

  static std::size_t receive(char* bytes, std::size_t size, std::size_t count, void* context) {
    Transfer& transfer = *static_cast<Transfer*>(context);
    long status = 0;
    curl_easy_getinfo(transfer.handle, CURLINFO_RESPONSE_CODE, &status);
    const std::string_view piece(bytes, size * count);
    try {
      if (status == 200) {
        transfer.handedOut = true;
        transfer.take(piece);
      } else if (transfer.complaint.size() < kLongestComplaint) {
        transfer.complaint += piece;
      }
    } catch (...) {
      transfer.failure = std::current_exception();
      return 0;
    }
    return piece.size();
  }
};

Server::Server(ServerAddress address) : address_(std::move(address)) {}

// With wait_end_of_query the server sends nothing before the statement has ended. Otherwise it
// would append a late failure to the rows of an answer that began as a success.
std::string Server::urlWith(const std::string& statement) const {
  std::string url = address_.url + "?wait_end_of_query=1&buffer_size=" + kAnswerBytes;
  if (!database_.empty()) url += "&database=" + database_;
  if (statement.empty()) return url;
  // The answer comes only once the rows are on all servers of a cluster. Users who may only read
  // may not set this.
  if (!address_.cluster.empty()) url += "&insert_distributed_sync=1";
  return url + "&query=" + encoded(statement);
}

void Server::refuse(std::string_view answer, long status) const {
  const int code = codeIn(answer);
  std::string text = address_.name + ": ";
  const std::string reason = reasonIn(answer);
  text += reason.empty() ? "the server answered with status " + std::to_string(status)
                         : "the server refused: " + reason;
  if (status >= 502 ||
      std::find(kPassingCodes.begin(), kPassingCodes.end(), code) != kPassingCodes.end())
    throw PassingError(text + ": try again later; logs that are already filed will count once");
  if (status == 401 || code == 192 || code == 193 || code == 194 || code == 516)
    throw ServerError(code, text + ": check the user and the password in the address");
  throw ServerError(code, text + ": check the address and the server's log");
}

void Server::perform(const std::string& url, std::string_view body, bool isRepeatable,
                     const std::function<void(std::string_view)>& take) {
  CurlErrorText words{};
  const CurlHandle owned = newHandle(shared_, address_);
  CURL* const handle = owned.get();
  Transfer transfer{handle, take, {}, {}};
  setOption(handle, CURLOPT_URL, url.c_str());
  setOption(handle, CURLOPT_POST, 1L);
  setOption(handle, CURLOPT_POSTFIELDSIZE_LARGE, static_cast<curl_off_t>(body.size()));
  setOption(handle, CURLOPT_POSTFIELDS, body.data());
  setOption(handle, CURLOPT_WRITEFUNCTION, Transfer::receive);
  setOption(handle, CURLOPT_WRITEDATA, &transfer);
  setOption(handle, CURLOPT_ERRORBUFFER, words.data());
  // On a reused connection, libcurl itself repeats a request that gets no answer, so
  // rows get a fresh connection.
  setOption(handle, CURLOPT_FRESH_CONNECT, isRepeatable ? 0L : 1L);
  const CURLcode code = curl_easy_perform(handle);
  if (transfer.failure) std::rethrow_exception(transfer.failure);
  if (code != CURLE_OK) {
    const std::string text = address_.name + ": " + curlFailure(code, words);
    if (transfer.handedOut) throw EngineError(text + ": the answer is incomplete; try again");
    if (isLasting(code)) throw EngineError(text + ": check the address and its ca-file");
    throw PassingError(text + ": check that the server runs and can be reached, and try again");
  }
  long status = 0;
  curl_easy_getinfo(handle, CURLINFO_RESPONSE_CODE, &status);
  if (status != 200) refuse(transfer.complaint, status);
}

std::string Server::ask(std::string_view statement) {
  std::string answer;
  ask(statement, [&](std::string_view piece) {
    answer += piece;
    if (answer.size() > kLongestText) {
      throw EngineError(address_.name +
                        ": does not answer as a ClickHouse server does: check the address");
    }
  });
  return answer;
}

void Server::ask(std::string_view statement, const std::function<void(std::string_view)>& take) {
  retry([&] { perform(urlWith({}), statement, true, take); });
}

void Server::insert(const std::string& statement, std::string_view rows) {
  perform(urlWith(statement), rows, false, [](std::string_view) {});
}

void Server::retry(const std::function<void()>& operation) const {
  auto pause = kFirstPause;
  for (int attempt = 0;; ++attempt) {
    try {
      return operation();
    } catch (const PassingError&) {
      if (attempt == address_.retries) throw;
    }
    std::this_thread::sleep_for(pause);
    pause = std::min(2 * pause, kLongestPause);
  }
}

std::string quoted(std::string_view text) {
  std::string out = "'";
  for (const char c : text) {
    if (static_cast<unsigned char>(c) < ' ' || c == '\'' || c == '\\') {
      out += "\\x";
      appendHexByte(out, c);
    } else {
      out += c;
    }
  }
  return out + "'";
}

}  // namespace tavrel::fleet
