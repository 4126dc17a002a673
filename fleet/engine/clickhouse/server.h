// A ClickHouse server, asked over HTTP.
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <string>
#include <string_view>

#include "fleet/engine/clickhouse/address.h"
#include "fleet/engine/engine.h"
#include "http/curl_share.h"

namespace tavrel::fleet {

/// What the server answered to a statement that it did not carry out.
struct ServerError : EngineError {
  static constexpr int kUnknownTable = 60;
  static constexpr int kUnknownDatabase = 81;

  ServerError(int number, const std::string& text) : EngineError(text), code(number) {}
  int code;  ///< ClickHouse's own; 0 when the answer has none
};

/// The server was away, too slow, or too busy. Whether it carried the statement out is not known.
struct PassingError : EngineError {
  using EngineError::EngineError;
};

class Server {
 public:
  explicit Server(ServerAddress address);

  const ServerAddress& address() const { return address_; }

  /// Statements refer to tables of this database from now on.
  void use(std::string database) { database_ = std::move(database); }

  /// Runs a statement and yields its answer.
  std::string ask(std::string_view statement);

  /// Hands the answer out in pieces, once the server has all of it. What `take` throws is passed
  /// on.
  void ask(std::string_view statement, const std::function<void(std::string_view)>& take);

  /// Runs the operation, again after pauses as long as it ends with a PassingError and the address
  /// allows.
  void retry(const std::function<void()>& operation) const;

  /// Sends rows after the statement, which must name a format. Never sends them twice.
  void insert(const std::string& statement, std::string_view rows);

 private:
  struct Transfer;
  using Handle = std::unique_ptr<void, void (*)(void*)>;

  Handle newHandle() const;
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
