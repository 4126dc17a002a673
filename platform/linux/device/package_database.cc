#include "platform/linux/device/package_database.h"

#include <cerrno>
#include <string>
#include <string_view>
#include <unordered_set>

#include "base/ascii.h"
#include "base/format.h"
#include "base/keyed_hash.h"
#include "platform/linux/files/line_reader.h"
#include "platform/linux/files/system_error.h"

namespace tavrel {
namespace {

constexpr std::string_view kStatusPath = "/var/lib/dpkg/status";
constexpr std::string_view kExtendedStatesPath = "/var/lib/apt/extended_states";

struct Paragraph {
  std::string package;
  std::string architecture;
  bool installed = false;
  bool automatic = false;
  bool base = false;

  std::string identifier() const { return package + ":" + architecture; }

  void take(std::string_view field, std::string_view value) {
    if (field == "Package") {
      package = value;
    } else if (field == "Architecture") {
      architecture = value;
    } else if (field == "Status") {
      // "WANTED FLAG STATE": a package on hold or selected for removal is still installed.
      installed = value.substr(value.find_last_of(' ') + 1) == "installed";
    } else if (field == "Priority") {
      base |= value == "required" || value == "important";
    } else if (field == "Essential" || field == "Protected") {
      base |= value == "yes";
    } else if (field == "Auto-Installed") {
      automatic = value == "1";
    }
  }
};

/// Calls `use` for every paragraph that names a package.
template <class Use>
void readParagraphs(LineReader& lines, Use use) {
  Paragraph paragraph;
  const auto finish = [&] {
    if (!paragraph.package.empty()) use(paragraph);
    paragraph = {};
  };
  while (const auto line = lines.next()) {
    if (line->empty()) {
      finish();
    } else if (line->front() != ' ' && line->front() != '\t') {
      const std::size_t colon = line->find(':');
      if (colon != std::string_view::npos) {
        paragraph.take(line->substr(0, colon), trimmed(line->substr(colon + 1)));
      }
    }
  }
  if (lines.errorNumber() == 0) finish();
}

class AutomaticPackages {
 public:
  explicit AutomaticPackages(LineReader& lines) {
    readParagraphs(lines, [this](const Paragraph& paragraph) {
      if (!paragraph.automatic) return;
      identifiers_.insert(paragraph.identifier());
      // apt files a package of architecture "all" under the machine's own.
      identifiers_.insert(paragraph.package + ":all");
    });
  }

  bool contains(const Paragraph& paragraph) const {
    return identifiers_.contains(paragraph.identifier()) ||
           identifiers_.contains(paragraph.package + ":");
  }

 private:
  std::unordered_set<std::string, KeyedHash> identifiers_;
};

void logFailure(SystemLog& log, std::string_view path, int errorNumber,
                std::string_view consequence) {
  if (errorNumber == 0 || errorNumber == ENOENT || errorNumber == ENOTDIR) return;
  log.log(LogLevel::Error, "%s; %s", systemError("read", path, errorNumber).message, consequence);
}

}  // namespace

std::size_t enumeratePackages(const DeviceRoot& root, SystemLog& log,
                              const std::function<void(const PWBundleProxy&)>& handler) {
  LineReader status(root.path(kStatusPath));
  std::size_t count = 0;
  if (status.errorNumber() == 0) {
    LineReader states(root.path(kExtendedStatesPath));
    const AutomaticPackages automatic(states);
    logFailure(log, root.path(kExtendedStatesPath), states.errorNumber(),
               "packages that were installed automatically count as installed by the user");
    readParagraphs(status, [&](const Paragraph& paragraph) {
      if (!paragraph.installed) return;
      ++count;
      const bool byUser = !paragraph.base && !automatic.contains(paragraph);
      handler({paragraph.identifier(), byUser ? PWUserApplicationType : kSystemApplicationType});
    });
  }
  logFailure(log, root.path(kStatusPath), status.errorNumber(),
             count == 0 ? "desktop entries are counted instead"
                        : format("only the first %zu packages count", count));
  return count;
}

}  // namespace tavrel
