// A ClickHouse server, reached over HTTP.
#pragma once

#include <functional>
#include <string>
#include <string_view>

#include "fleet/engine/clickhouse/address.h"
#include "fleet/engine/engine.h"
#include "http/curl_share.h"

namespace tavrel::fleet {

/// The server refused a statement; the text is its answer.
struct ServerError : EngineError {
  static constexpr int kUnknownTable = 60;
  static constexpr int kUnknownDatabase = 81;

  ServerError(int number, const std::string& text) : EngineError(text), code(number) {}
  int code;  // ClickHouse's error code; 0 when the answer has none
};

/// The server was unreachable, too slow, or too busy. It may or may not have run the statement.
struct PassingError : EngineError {
  using EngineError::EngineError;
};

class Server {
 public:
  explicit Server(ServerAddress address);

  const ServerAddress& address() const { return address_; }

  /// From now on, statements refer to tables of this database.
  void use(std::string database) { database_ = std::move(database); }

  /// Runs a statement and returns its answer.
  std::string ask(std::string_view statement);

  /// Hands out the answer in pieces once the server has all of it. Exceptions
  /// from `take` reach the caller.
  void ask(std::string_view statement, const std::function<void(std::string_view)>& take);

  /// Runs the operation. As long as it ends with a PassingError, runs it again after a pause, up to
  /// the number of retries in the address.
  void retry(const std::function<void()>& operation) const;

  /// Sends the statement, which must name a format, followed by the rows. Never sends them twice.
  void insert(const std::string& statement, std::string_view rows);

 private:
  struct Transfer;

  void perform(const std::string& url, std::string_view body, bool isRepeatable,
               const std::function<void(std::string_view)>& take);
  std::string urlWith(const std::string& statement) const;
  [[noreturn]] void refuse(std::string_view answer, long status) const;

  ServerAddress address_;
  std::string database_;
  CurlShare shared_;
};

/// `text` as a literal of the query language.
std::string quoted(std::string_view text);

}  // namespace tavrel::fleet
