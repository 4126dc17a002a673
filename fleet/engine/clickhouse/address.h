// Where a ClickHouse server is, and how it is spoken to.
#pragma once

#include <chrono>
#include <string>
#include <string_view>

namespace tavrel::fleet {

struct ServerAddress {
  std::string name;  ///< for messages: scheme, host, port and database, without a password
  std::string url;   ///< of its HTTP interface, with a slash at the end
  std::string user;
  std::string password;
  std::string passwordFile;   ///< has the password; empty without
  std::string authorityFile;  ///< trusted in place of the system's authorities; empty without
  std::string database;
  std::string cluster;                ///< empty without
  std::chrono::seconds timeout{300};  ///< of one request, with its answer
  int retries = 7;                    ///< of a request that fails for a passing reason
};

/// Whether the text is meant as the address of a server.
bool isServerAddress(std::string_view text);

/// clickhouse[s]://[USER[:PASSWORD]@]HOST[:PORT]/DATABASE[?OPTION=VALUE[&…]], with the options
/// "cluster", "password-file", "ca-file", "timeout" (in seconds) and "retries". Looks at the text
/// only. Throws EngineError.
ServerAddress parseServerAddress(std::string_view text);

/// The same with the password from its file. Throws EngineError.
ServerAddress readServerAddress(std::string_view text);

}  // namespace tavrel::fleet
