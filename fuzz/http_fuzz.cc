// What servers answer, over a real connection: to the uploader, and, as rows, to the fleet's
// questions; and the headers in which a log's metadata travels. Numbers from headers stay within
// their bounds, and texts on one line. Rows are the same in whatever pieces they arrive. What a
// header says of a log's versions, the fleet reads back.
//
// Input: a byte that chooses, then the answer, the rows, or a property list.
#include <arpa/inet.h>
#include <optional>
#include <poll.h>
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

/// Answers each request at a port of this machine with the same bytes, and ends the connection. It
/// works while libcurl waits, in the same thread: handing over to another would take far longer
/// than all the rest.
class AnsweringServer {
 public:
  AnsweringServer() : listener_(socket(AF_INET, SOCK_STREAM | SOCK_CLOEXEC | SOCK_NONBLOCK, 0)) {
    sockaddr_in address{AF_INET, 0, {htonl(INADDR_LOOPBACK)}, {}};
    socklen_t size = sizeof address;
    auto* const plain = reinterpret_cast<sockaddr*>(&address);
    require(bind(listener_.get(), plain, size) == 0 && listen(listener_.get(), 16) == 0);
    require(getsockname(listener_.get(), plain, &size) == 0);
    url = "http://127.0.0.1:" + std::to_string(ntohs(address.sin_port)) + "/";
  }
  void answerWith(std::string answer) {
    peers_.clear();
    answer_ = std::move(answer);
  }
  void serve() {
    while (Descriptor peer{accept4(listener_.get(), nullptr, nullptr, SOCK_CLOEXEC)}) {
      send(peer.get(), answer_.data(), answer_.size(), MSG_NOSIGNAL);
      shutdown(peer.get(), SHUT_WR);
      peers_.push_back(std::move(peer));
    }
  }
  std::string url;

 private:
  Descriptor listener_;
  std::string answer_;
  std::vector<Descriptor> peers_;
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
  // An ordinary answer comes first: what is left of it must not matter.
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

// All rows, encoded again, and whether the answer ended within one.
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
            add(row.log, row.day, row.created, row.osVersion, row.previousOsVersion,
                row.configNumber, row.whitelistDigest, row.taskID, row.language,
                row.preferredLanguage, row.region);
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
          for (const fleet::DistributionValue& row : rows)
            add(row.log, row.numbers.minimum, row.numbers.maximum, row.numbers.mean,
                row.numbers.squaredDeviations, row.numbers.count);
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

// libcurl's.
extern "C" int poll(pollfd* files, nfds_t count, int milliseconds) {
  theServer().serve();
  const timespec longest{milliseconds / 1000, milliseconds % 1000 * 1'000'000L};
  return ppoll(files, count, milliseconds < 0 ? nullptr : &longest, nullptr);
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
