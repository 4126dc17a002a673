#include "fleet/engine/clickhouse/address.h"

#include <algorithm>
#include <curl/curl.h>
#include <memory>
#include <utility>

#include "base/ascii.h"
#include "base/parse_number.h"
#include "fleet/engine/engine.h"
#include "fleet/engine/regular_file.h"

namespace tavrel::fleet {
namespace {

constexpr std::string_view kPlain = "clickhouse://";
constexpr std::string_view kEncrypted = "clickhouses://";
constexpr std::size_t kLongestPassword = 4096;
constexpr int kLongestTimeout = 86'400;
constexpr int kMostRetries = 20;

[[noreturn]] void refuse(const std::string& what) {
  throw EngineError("the database's address " + what +
                    ": write clickhouse[s]://[USER@]HOST[:PORT]/NAME[?OPTION=VALUE[&...]]");
}

struct Free {
  void operator()(char* text) const { curl_free(text); }
};
using CurlText = std::unique_ptr<char, Free>;

std::string part(CURLU* url, CURLUPart which, unsigned flags = CURLU_URLDECODE) {
  char* text = nullptr;
  if (curl_url_get(url, which, &text, flags) != CURLUE_OK) return {};
  return CurlText(text).get();
}

// Names go into statements unquoted.
void checkName(const std::string& what, std::string_view name) {
  const auto isPlain = [](char c) { return isLetterOrDigit(c) || c == '_'; };
  if (name.empty() || !std::all_of(name.begin(), name.end(), isPlain))
    refuse("needs a " + what + " with a name of letters, digits and underscores");
}

std::string passwordIn(const std::string& path) {
  auto password = readBeginning(path, kLongestPassword + 1);
  if (!password) throw EngineError(path + ": no such file: name the file that holds the password");
  if (password->size() > kLongestPassword) {
    throw EngineError(path + ": has more than " + std::to_string(kLongestPassword) +
                      " bytes: name a file that holds only a password");
  }
  while (password->ends_with('\n') || password->ends_with('\r'))
    password->pop_back();
  return *std::move(password);
}

int numberIn(const std::string& name, std::string_view text, int lowest, int highest) {
  const auto number = parseNumber<int>(text);
  if (!number || *number < lowest || *number > highest) {
    refuse("needs a number from " + std::to_string(lowest) + " to " + std::to_string(highest) +
           " as its " + name);
  }
  return *number;
}

std::string decoded(std::string_view text) {
  if (text.empty()) return {};  // libcurl would read on to the end of the string
  int size = 0;
  const CurlText plain(
      curl_easy_unescape(nullptr, text.data(), static_cast<int>(text.size()), &size));
  return plain ? std::string(plain.get(), static_cast<std::size_t>(size)) : std::string();
}

void readOptions(ServerAddress& address, std::string_view query) {
  while (!query.empty()) {
    const std::string_view option = query.substr(0, query.find('&'));
    query.remove_prefix(std::min(query.size(), option.size() + 1));
    const std::size_t sign = option.find('=');
    const std::string_view name = option.substr(0, sign);
    const std::string value = sign == option.npos ? "" : decoded(option.substr(sign + 1));
    if (name == "cluster") {
      checkName("cluster", value);
      address.cluster = value;
    } else if (name == "password-file" || name == "ca-file") {
      if (value.empty()) refuse("needs a file as its " + std::string(name));
      (name == "ca-file" ? address.authorityFile : address.passwordFile) = value;
    } else if (name == "timeout") {
      address.timeout = std::chrono::seconds(numberIn("timeout", value, 1, kLongestTimeout));
    } else if (name == "retries") {
      address.retries = numberIn("retries", value, 0, kMostRetries);
    } else {
      throw EngineError("the database's address has the unknown option \"" + std::string(name) +
                        "\": give cluster, password-file, ca-file, timeout or retries");
    }
  }
}

}  // namespace

bool isServerAddress(std::string_view text) {
  return text.starts_with(kPlain) || text.starts_with(kEncrypted);
}

ServerAddress parseServerAddress(std::string_view text) {
  const bool encrypted = text.starts_with(kEncrypted);
  const std::unique_ptr<CURLU, void (*)(CURLU*)> url(curl_url(), curl_url_cleanup);
  const std::string whole(text);
  if (!url ||
      curl_url_set(url.get(), CURLUPART_URL, whole.c_str(), CURLU_NON_SUPPORT_SCHEME) != CURLUE_OK)
    refuse("is malformed");

  ServerAddress address;
  const std::string host = part(url.get(), CURLUPART_HOST, 0);
  std::string port = part(url.get(), CURLUPART_PORT);
  if (port.empty()) port = encrypted ? "8443" : "8123";
  if (host.empty()) refuse("has no host");
  address.database = part(url.get(), CURLUPART_PATH);
  if (address.database.starts_with('/')) address.database.erase(0, 1);
  checkName("database", address.database);
  address.name =
      std::string(encrypted ? kEncrypted : kPlain) + host + ":" + port + "/" + address.database;
  address.url = std::string(encrypted ? "https://" : "http://") + host + ":" + port + "/";
  address.user = part(url.get(), CURLUPART_USER);
  address.password = part(url.get(), CURLUPART_PASSWORD);
  readOptions(address, part(url.get(), CURLUPART_QUERY, 0));
  return address;
}

ServerAddress readServerAddress(std::string_view text) {
  ServerAddress address = parseServerAddress(text);
  if (!address.passwordFile.empty()) address.password = passwordIn(address.passwordFile);
  if (address.user.empty() && !address.password.empty()) address.user = "default";
  return address;
}

}  // namespace tavrel::fleet
