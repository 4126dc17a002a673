#include "upload/configuration.h"

#include <algorithm>
#include <curl/curl.h>
#include <memory>
#include <optional>
#include <string_view>
#include <unistd.h>

#include "base/ascii.h"
#include "base/format.h"
#include "base/limits.h"
#include "platform/linux/files/property_list_file.h"

namespace tavrel::upload {
namespace {

constexpr std::string_view kCredentialPrefix = "tavrel-upload.";

struct Duration {
  std::string_view key;
  std::chrono::seconds Configuration::*member;
};
constexpr Duration kDurations[] = {{"ConnectSeconds", &Configuration::connect},
                                   {"StallSeconds", &Configuration::stall},
                                   {"TransferSeconds", &Configuration::transfer},
                                   {"RunSeconds", &Configuration::run}};

struct Switch {
  std::string_view key;
  bool Configuration::*member;
};
constexpr Switch kSwitches[] = {{"AllowPlainHTTP", &Configuration::mayBePlain},
                                {"NeedsDefaultRoute", &Configuration::needsDefaultRoute}};

constexpr std::string_view kUrlKey = "URL";
constexpr std::string_view kMeteredKey = "MeteredInterfaces";

constexpr const char* kNoUrl = "URL is not an address: give https://HOST/FOLDER";

// Nothing when the URL lacks that part.
std::optional<std::string> partOf(CURLU* url, CURLUPart part) {
  char* text = nullptr;
  if (curl_url_get(url, part, &text, 0) != CURLUE_OK) return std::nullopt;
  const std::unique_ptr<char, void (*)(void*)> owned(text, curl_free);
  return std::string(text);
}

// Returns what is wrong with the URL; empty when it is usable.
std::string takeUrl(std::string_view text, Configuration& configuration) {
  const std::unique_ptr<CURLU, void (*)(CURLU*)> url(curl_url(), curl_url_cleanup);
  configuration.url = text;
  const auto isUnfit = [](char c) { return static_cast<unsigned char>(c) <= ' ' || c == 0x7F; };
  const bool isUrl = std::none_of(text.begin(), text.end(), isUnfit) &&
                     curl_url_set(url.get(), CURLUPART_URL, configuration.url.c_str(),
                                  CURLU_NON_SUPPORT_SCHEME) == CURLUE_OK;
  const auto scheme = isUrl ? partOf(url.get(), CURLUPART_SCHEME) : std::nullopt;
  if (scheme == "http" && !configuration.mayBePlain) {
    return "URL begins with http: use https, or set AllowPlainHTTP in a laboratory";
  }
  if (scheme != "https" && scheme != "http") {
    return kNoUrl;
  }
  // libcurl reports no part for an empty query or fragment, but a log's name after one would not
  // belong to the path.
  if (partOf(url.get(), CURLUPART_USER) || partOf(url.get(), CURLUPART_PASSWORD) ||
      text.find_first_of("?#") != std::string_view::npos) {
    return "URL has more than a host and a path: leave out user, query and fragment";
  }
  std::string host = partOf(url.get(), CURLUPART_HOST).value_or("");
  std::transform(host.begin(), host.end(), host.begin(),
                 [](char c) { return c >= 'A' && c <= 'Z' ? static_cast<char>(c + 32) : c; });
  if (host.starts_with('[')) host = host.substr(1, host.size() - 2);
  configuration.host = std::move(host);
  while (configuration.url.ends_with('/'))
    configuration.url.pop_back();
  return {};
}

std::string takeInterfaces(const plist::Value& value, Configuration& configuration) {
  const std::string wanted = "MeteredInterfaces is not an array of names: give strings like wwan*";
  if (!value.array()) return wanted;
  for (const plist::Value& name : value.array()) {
    if (!name.string()) return wanted;
    configuration.meteredInterfaces.emplace_back(*name.string());
  }
  return {};
}

// Returns what is wrong with the entry; empty when it is known and its value has the right type.
std::string takeEntry(std::string_view key, const plist::Value& value,
                      Configuration& configuration) {
  constexpr std::int64_t kLongest = limits::kLongestUploadPauseSeconds;
  for (const Duration& duration : kDurations) {
    if (key != duration.key) continue;
    const auto number = value.number();
    if (!number || number->isFloating() || number->int64() < 1 || number->int64() > kLongest) {
      return format("%s is not a time: give an integer from 1 to %lld seconds", key, kLongest);
    }
    configuration.*duration.member = std::chrono::seconds(number->int64());
    return {};
  }
  for (const Switch& item : kSwitches) {
    if (key != item.key) continue;
    if (!value.boolean()) return format("%s is not a boolean: give true or false", key);
    configuration.*item.member = *value.boolean();
    return {};
  }
  if (key == kMeteredKey) return takeInterfaces(value, configuration);
  // Its text is checked once it is known whether it may be plain.
  if (key == kUrlKey) return value.string() ? std::string() : kNoUrl;
  return format("%s is not a setting: see tavrel-upload(8)", key.substr(0, 100));
}

// Tokens are sent unescaped in a header (RFC 6750).
bool isToken(std::string_view text) {
  return !text.empty() && std::all_of(text.begin(), text.end(), [](char c) {
    return isLetterOrDigit(c) || std::string_view("-._~+/=").find(c) != std::string_view::npos;
  });
}

Status readCredentials(FileSystem& files, const std::string& folder, Configuration& configuration) {
  const auto pathOf = [&](std::string_view name) {
    std::string path = folder;
    path += '/';
    path += kCredentialPrefix;
    path += name;
    return path;
  };
  const auto pathIfThere = [&](std::string_view name) {
    std::string path = pathOf(name);
    return access(path.c_str(), F_OK) == 0 ? path : std::string();
  };
  configuration.certificate = pathIfThere("certificate");
  configuration.key = pathIfThere("key");
  configuration.authority = pathIfThere("authority");
  if (configuration.certificate.empty() != configuration.key.empty()) {
    return Error{
        format("cannot use the client certificate: the credential tavrel-upload.%s is "
               "missing: give both",
               configuration.key.empty() ? "key" : "certificate")};
  }
  auto token = files.readIfPresent(pathOf("token"), limits::kSystemFactBytes);
  if (!token) return token.error();
  if (!*token) return Done{};
  const std::size_t end = (*token)->find_last_not_of("\r\n");
  configuration.token = (*token)->substr(0, end == std::string::npos ? 0 : end + 1);
  if (isToken(configuration.token)) return Done{};
  return Error{
      "cannot use the credential tavrel-upload.token: a token has letters, digits and "
      "-._~+/= on one line"};
}

}  // namespace

Expected<Configuration> readConfiguration(const DeviceRoot& root, FileSystem& files,
                                          PropertyListCoding& propertyLists,
                                          const std::string& credentials) {
  const std::string path = root.path(kConfigurationPath);
  const auto unusable = [&](std::string_view why) {
    return Error{format("cannot use %s: %s", path, why)};
  };
  const auto bytes = files.readIfPresent(path, limits::kSystemFactBytes);
  if (!bytes) return bytes.error();
  if (!*bytes) return unusable("it is missing: create it as tavrel-upload(8) describes");
  if (const auto reason = reasonToDistrust(path); !reason.empty()) return unusable(reason);
  const auto value = propertyLists.decode(asBytes(**bytes));
  if (!value) return unusable(value.error().message);
  const plist::Dictionary settings = value->dictionary();
  if (!settings) return unusable("it is not a dictionary");

  Configuration configuration;
  for (const auto& [key, setting] : settings) {
    if (const std::string why = takeEntry(key.view(), setting, configuration); !why.empty())
      return unusable(why);
  }
  const auto url = settings.string(kUrlKey);
  if (!url) return unusable("URL is missing: give https://HOST/FOLDER");
  if (const std::string why = takeUrl(*url, configuration); !why.empty()) return unusable(why);
  if (!credentials.empty()) {
    if (Status read = readCredentials(files, credentials, configuration); !read)
      return read.error();
  }
  return configuration;
}

}  // namespace tavrel::upload
