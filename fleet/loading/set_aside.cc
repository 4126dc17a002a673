#include "fleet/loading/set_aside.h"

#include <algorithm>
#include <string_view>
#include <utility>

#include "base/text.h"
#include "fleet/logs/limits.h"
#include "fleet/logs/record_digest.h"
#include "fleet/sources/file_name.h"
#include "fleet/sources/sources.h"
#include "tools/console/table.h"

namespace tavrel::fleet {
namespace {

constexpr mode_t kMode = 0640;

// Makes a harmless file name: an archive may name its members anything.
std::string safeName(std::string_view name) {
  constexpr std::size_t kLongest = 150;
  constexpr std::string_view kSafe =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789._-";
  std::string safe(name.substr(0, kLongest));
  std::ranges::replace_if(
      safe, [&](char letter) { return kSafe.find(letter) == std::string_view::npos; }, '_');
  return safe;
}

}  // namespace

Status SetAside::keep(const SourceItem& refused) {
  std::string fromFile;
  if (refused.content.empty() && !refused.path.empty()) {
    if (auto read = readSourceFile(refused.path, limits::kLogBytes, refused.mayBeLink)) {
      fromFile = *std::move(read);
    }
  }
  const std::string& bytes = refused.content.empty() ? fromFile : refused.content;
  constexpr std::size_t kDigits = 16;
  std::string digest;
  // Logs that cannot be read have no bytes; their place tells them apart.
  appendHex(digest, sha256Of(asBytes(bytes.empty() ? refused.name : bytes)));
  const std::string path =
      folder_ + '/' + digest.substr(0, kDigits) + '-' + safeName(fileNameOf(refused.name));
  if (!bytes.empty()) {
    if (Status done = write(path, asBytes(bytes)); !done) return done;
  }
  // Printable, since people may show the file on a terminal.
  const std::string reason = printable(refused.name + ": " + refused.reason) + '\n';
  return write(path + ".reason", asBytes(reason));
}

Status SetAside::write(const std::string& path, ByteSpan bytes) {
  const auto present = files_.readIfPresent(path, bytes.size());
  if (present && *present == asText(bytes)) return Done{};
  return files_.replace(path, bytes, kMode);
}

}  // namespace tavrel::fleet
