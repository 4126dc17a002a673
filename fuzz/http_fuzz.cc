// Answers of servers, through all of libcurl: to the uploader and, as rows, to the fleet's
// questions; and the headers that carry a log's metadata. Numbers from headers must stay within
// their bounds, and texts on one line. Rows must not depend on the pieces in which they arrive. The
// fleet must read back what a header says about a log's versions.
//
// Input: a byte that chooses the subject, then the answer, the rows, or a property list.
#include <array>
#include <cerrno>
#include <map>
#include <optional>
#include <sys/socket.h>
#include <vector>

#include "base/limits.h"
#include "fleet/engine/clickhouse/clickhouse_reading.h"
#include "fleet/engine/clickhouse/row_binary.h"
#include "fleet/logs/log_metadata.h"
#include "platform/linux/files/descriptor.h"
#include "platform/plist/coding.h"
#include "support.h"
#include "upload/connection.h"
#include "upload/headers.h"

using namespace tavrel;
using fuzz::require;

namespace {

/// Answers each connection with the same bytes and closes it. What libcurl takes for TCP
/// is a pair of sockets whose other end is here: the kernel's network would take far
/// longer than everything else.
class AnsweringServer {
 public:
  void answerWith(std::string answer) {
    peers_.clear();
    answer_ = std::move(answer);
  }
  int makeSocket(int type) {
    std::array<int, 2> ends{};
    if (socketpair(AF_UNIX, type, 0, ends.data()) != 0) return -1;
    peers_[ends[0]] = Descriptor(ends[1]);
    return ends[0];
  }
  int connectFrom(int client) {
    const int peer = peers_.at(client).get();
    send(peer, answer_.data(), answer_.size(), MSG_NOSIGNAL);
    return shutdown(peer, SHUT_WR);
  }
  const std::string url = "http://127.0.0.1:80/";

 private:
  std::string answer_;
  std::map<int, Descriptor> peers_;  // by the client's end
};

AnsweringServer& theServer() {
  static AnsweringServer server;
  return server;
}

bool isOneLine(std::string_view text) {
  return text.find_first_of("\r\n") == std::string_view::npos;
}

void putLog(const std::string& answer) {
  static const upload::Configuration configuration = [] {
    upload::Configuration made;
    made.mayBePlain = true;
    return made;
  }();
  upload::Connection connection(configuration);
  std::optional<Expected<upload::Answer>> got;
  // An ordinary answer comes first: nothing that it leaves behind may matter.
  for (const std::string& next :
       {std::string("HTTP/1.1 201 Created\r\nTavrel-Received: x\r\nContent-Length: 0\r\n\r\n"),
        answer}) {
    theServer().answerWith(next);
    got = connection.put(theServer().url + "x.log", {"Content-Digest: x"}, "body",
                         std::chrono::seconds(5), [] { return true; });
  }
  require(!connection.isMisconfigured());
  if (!*got) return require(!got->error().message.empty() && isOneLine(got->error().message));
  const upload::Answer& said = **got;
  require(said.status >= 0 && said.status < 1000);
  require(said.retryAfter >= 0 && said.retryAfter <= limits::kLongestUploadPauseSeconds);
  require(isOneLine(said.received));
  require(isOneLine(upload::percentEncoded(said.location.substr(0, 200))));
}

fleet::ServerAddress addressOfServer() {
  fleet::ServerAddress address;
  address.name = "server";
  address.url = theServer().url;
  address.timeout = std::chrono::seconds(5);
  address.retries = 0;
  return address;
}

// All rows, encoded again, plus whether the answer ended in the middle of one.
std::string rowsOf(fleet::Server& server, unsigned table, std::string answer) {
  theServer().answerWith(std::move(answer));
  fleet::ClickhouseReading reading(server);
  std::string all;
  const auto add = [&](const auto&... values) { fleet::putAll(all, values...); };
  try {
    switch (table % 5) {
      case 0:
        reading.logs(0, 1, [&](std::span<const fleet::LogRow> rows) {
          for (const fleet::LogRow& row : rows)
            add(row.log, row.day, row.osVersion, row.whitelistDigest, row.region);
        });
        break;
      case 1:
        for (const fleet::Key& key : reading.keys())
          add(static_cast<std::uint8_t>(key.kind), std::string_view(key.name));
        break;
      case 2:
        reading.scalars("a'b", [&](std::span<const fleet::ScalarValue> rows) {
          for (const fleet::ScalarValue& row : rows)
            add(row.log, row.value);
        });
        break;
      case 3:
        reading.distributions("a", [&](std::span<const fleet::DistributionValue> rows) {
          for (const fleet::DistributionValue& row : rows) {
            add(row.log, row.numbers.minimum, row.numbers.maximum, row.numbers.mean,
                row.numbers.squaredDeviations, row.numbers.count);
          }
        });
        break;
      default:
        reading.cells("a", [&](std::span<const fleet::CellValue> rows) {
          for (const fleet::CellValue& row : rows)
            add(row.log, row.lower, row.upper, row.count);
        });
    }
  } catch (const fleet::EngineError& error) {
    require(error.what()[0] != '\0' && isOneLine(error.what()));
    if (table % 5 == 1) all.clear();  // keys are handed out all at once
    all += "incomplete";
  }
  return all;
}

std::string inOne(std::string_view body) {
  return "HTTP/1.1 200 OK\r\nContent-Length: " + std::to_string(body.size()) + "\r\n\r\n" +
         std::string(body);
}

std::string inPieces(std::string_view body, std::size_t bytes) {
  std::string answer = "HTTP/1.1 200 OK\r\nTransfer-Encoding: chunked\r\n\r\n";
  for (; !body.empty(); body.remove_prefix(std::min(bytes, body.size()))) {
    const std::string_view piece = body.substr(0, bytes);
    char digits[32];
    answer.append(digits, static_cast<std::size_t>(
                              std::snprintf(digits, sizeof digits, "%zx\r\n", piece.size())));
    answer.append(piece).append("\r\n");
  }
  return answer + "0\r\n\r\n";
}

void sendMetadata(ByteSpan document) {
  const auto metadata = plist::read(document);
  if (!metadata) return;
  const plist::Dictionary dictionary = metadata->dictionary();
  for (const std::string& header : upload::metadataHeaders(dictionary)) {
    require(header.size() < 2 * limits::kUploadHeaderBytes);
    for (const char c : header)
      require(c >= ' ' && c <= '~');
    constexpr std::string_view kVersion = "Tavrel-OS-Version: ";
    if (!header.starts_with(kVersion)) continue;
    require(fleet::percentDecoded(std::string_view(header).substr(kVersion.size())) ==
            dictionary.string("OSVersion"));
  }
}

}  // namespace

// Replaces the C library's function for libcurl.
extern "C" int socket(int domain, int type, int) noexcept {
  if (domain == AF_INET) return theServer().makeSocket(type);
  errno = EAFNOSUPPORT;
  return -1;
}
extern "C" int connect(int socket, const sockaddr*, socklen_t) {
  return theServer().connectFrom(socket);
}
extern "C" int setsockopt(int, int, int, const void*, socklen_t) noexcept {
  return 0;
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  fuzz::Input input(data, size);
  fleet::Server server(addressOfServer());
  const unsigned choice = input.byte();
  switch (choice % 8) {
    case 0:
      putLog(std::string(input.text()));
      break;
    case 1:
      putLog("HTTP/1.1 201 Created\r\n" + std::string(input.text()));
      break;
    case 2:
      rowsOf(server, choice / 8, std::string(input.text()));
      break;
    case 3:
      sendMetadata(input.bytes());
      break;
    default: {
      const unsigned table = choice / 8;
      const std::string whole = rowsOf(server, table, inOne(input.text()));
      require(whole ==
              rowsOf(server, table, inPieces(input.text(), choice % 8 == 4 ? 1 : 3 + choice % 8)));
    }
  }
  return 0;
}
