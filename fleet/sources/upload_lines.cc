#include "fleet/sources/upload_lines.h"

#include <array>
#include <cstdint>
#include <memory>
#include <nlohmann/json.hpp>
#include <utility>
#include <zlib.h>

#include "base/format.h"
#include "platform/linux/files/system_error.h"

namespace tavrel::fleet {
namespace {

struct Close {
  void operator()(gzFile_s* file) const { gzclose(file); }
};

std::string textOf(const nlohmann::json& object, const char* key) {
  const auto member = object.find(key);
  return member != object.end() && member->is_string() ? member->get<std::string>() : std::string();
}

std::string keyOf(std::string_view device, std::string_view log) {
  return std::string(device).append("/").append(log);
}

}  // namespace

bool UploadLines::add(std::string_view line) {
  const auto object = nlohmann::json::parse(line, nullptr, false);
  if (!object.is_object()) return false;
  const auto status = object.find("status");
  if (status == object.end() || !status->is_number_integer()) return false;
  const auto code = status->get<std::int64_t>();
  if (code != 200 && code != 201 && code != 204) return false;
  const std::string log = textOf(object, "log");
  if (log.empty()) return false;
  LogMetadata metadata;
  metadata.logType = percentDecoded(textOf(object, "type"));
  metadata.osVersion = percentDecoded(textOf(object, "os_version"));
  readOptions(textOf(object, "options"), metadata);
  logs_.insert_or_assign(keyOf(textOf(object, "device"), log), std::move(metadata));
  return true;
}

Expected<std::size_t> UploadLines::read(const std::string& path) {
  if (!asked_) asked_ = std::time(nullptr);
  // Longer than any line of a server that bounds its headers.
  constexpr std::size_t kLineBytes = 64U << 10;
  const std::unique_ptr<gzFile_s, Close> file(gzopen(path.c_str(), "rbe"));
  if (!file) return systemError("read", path);
  std::size_t useless = 0;
  const auto buffer = std::make_unique<std::array<char, kLineBytes>>();
  bool isRest = false;
  while (gzgets(file.get(), buffer->data(), static_cast<int>(buffer->size())) != nullptr) {
    const std::string_view line(buffer->data());
    const bool isWhole = line.ends_with('\n') || line.size() + 1 < buffer->size();
    if (!isRest && !(isWhole && add(line))) ++useless;
    isRest = !isWhole;
  }
  int code = Z_OK;
  const std::string words = gzerror(file.get(), &code);
  if (code != Z_OK && code != Z_STREAM_END) {
    if (code == Z_ERRNO) return systemError("read", path);
    return Error{format("cannot read %s: %s", path, words)};
  }
  return useless;
}

const LogMetadata* UploadLines::find(std::string_view device, std::string_view log) const {
  const auto found = logs_.find(keyOf(device, log));
  return found == logs_.end() ? nullptr : &found->second;
}

bool UploadLines::mayFollow(std::time_t written) const {
  constexpr std::time_t kSlackSeconds = 60;
  // A time in the future is that of a clock that was wrong, and tells nothing.
  return asked_ && written >= *asked_ - kSlackSeconds &&
         written <= std::time(nullptr) + kSlackSeconds;
}

}  // namespace tavrel::fleet
