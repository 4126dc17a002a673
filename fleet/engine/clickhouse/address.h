// The address of a ClickHouse server, and how to talk to it.
#pragma once

#include <chrono>
#include <string>
#include <string_view>

namespace tavrel::fleet {

struct ServerAddress {
  std::string name;  // for messages: scheme, host, port and database, without a password
  std::string url;   // of its HTTP interface, with a trailing slash
  std::string user;
  std::string password;
  std::string passwordFile;   // the file with the password; empty without one
  std::string authorityFile;  // trusted instead of the system's authorities; empty without one
  std::string database;
  std::string cluster;                // empty without one
  std::chrono::seconds timeout{300};  // for one request and its answer
  int retries = 7;                    // of a request that fails for a transient reason
};

/// Whether the text looks like the address of a server.
bool isServerAddress(std::string_view text);

/// clickhouse[s]://[USER[:PASSWORD]@]HOST[:PORT]/DATABASE[?OPTION=VALUE[&…]], with the options
/// "cluster", "password-file", "ca-file", "timeout" (in seconds) and "retries". Parses only the
/// text and opens no file. Throws EngineError.
ServerAddress parseServerAddress(std::string_view text);

/// Also reads the password from its file. Throws EngineError.
ServerAddress readServerAddress(std::string_view text);

}  // namespace tavrel::fleet
