#include "upload/headers.h"

#include <algorithm>
#include <utility>

#include "base/ascii.h"
#include "base/iso_date.h"
#include "base/limits.h"
#include "base/text.h"
#include "platform/linux/logs/file_submission.h"

namespace tavrel::upload {
namespace {

constexpr std::pair<std::string_view, std::string_view> kTexts[] = {
    {kLogMetadataType, "Tavrel-Log-Type: "},
    {kLogMetadataName, "Tavrel-Log-Name: "},
    {kLogMetadataVersion, "Tavrel-OS-Version: "}};

// "key=value&key=value", in the order of the keys. Entries that do not fit are left out.
std::string optionsText(const plist::Dictionary& options) {
  std::vector<std::string> entries;
  for (const auto& [key, value] : options) {
    std::string entry = percentEncoded(key.view(), "&=");
    entry += '=';
    entry += percentEncoded(textOf(value), "&");
    entries.push_back(std::move(entry));
  }
  std::sort(entries.begin(), entries.end());
  std::string text;
  for (const std::string& entry : entries) {
    if (text.size() + entry.size() >= limits::kUploadHeaderBytes) continue;
    if (!text.empty()) text += '&';
    text += entry;
  }
  return text;
}

}  // namespace

std::string percentEncoded(std::string_view text, std::string_view also) {
  std::string out;
  for (const char c : text) {
    if (c >= ' ' && c < 0x7F && c != '%' && also.find(c) == std::string_view::npos) {
      out += c;
    } else {
      out += '%';
      appendHexByte(out, c);
    }
  }
  return out;
}

std::vector<std::string> metadataHeaders(const plist::Dictionary& metadata) {
  std::vector<std::string> headers;
  for (const auto& [key, header] : kTexts) {
    const auto text = metadata.string(key);
    if (!text || text->empty()) continue;
    const std::string value = percentEncoded(*text);
    if (value.size() < limits::kUploadHeaderBytes) headers.push_back(std::string(header) + value);
  }
  if (const auto time = metadata.date(kLogMetadataTime)) {
    std::string header = "Tavrel-Filed: ";
    if (appendIsoInstant(header, *time)) headers.push_back(std::move(header));
  }
  const std::string options = optionsText(metadata.dictionary(kLogMetadataOptions));
  if (!options.empty()) headers.push_back("Tavrel-Options: " + options);
  return headers;
}

}  // namespace tavrel::upload
