#include "platform/linux/preferences/file_preferences.h"

#include <algorithm>
#include <utility>

#include "base/limits.h"
#include "base/text.h"
#include "platform/guarded.h"
#include "platform/linux/files/random.h"
#include "platform/linux/files/stamp.h"

namespace tavrel {
namespace {

constexpr std::string_view kEnding = ".plist";
constexpr std::string_view kSetAsideMark = ".corrupt-";
constexpr mode_t kMode = 0640;

static_assert(Preferences::kLargestChange <= limits::kPreferenceFileBytes / 8);

}  // namespace

FilePreferences::FilePreferences(const DeviceRoot& root, FileSystem& files,
                                 PropertyListCoding& propertyLists, Clock& clock, SystemLog& log)
    : folder_(root.path(kPreferencesFolder)),
      files_(files),
      propertyLists_(propertyLists),
      clock_(clock),
      log_(log) {}

FilePreferences::~FilePreferences() {
  for (auto& entry : domains_) {
    runGuarded(log_, "write the last preferences", [&] { synchronize(entry.second, entry.first); });
  }
}

bool FilePreferences::isValidDomain(std::string_view domain) {
  return !domain.empty() && domain.size() <= limits::kPreferenceDomainBytes && domain[0] != '.' &&
         std::none_of(domain.begin(), domain.end(), [](char c) {
           const auto code = static_cast<unsigned char>(c);
           return code < 0x20 || code == 0x7F || c == '/';
         });
}

plist::Value FilePreferences::ZTXPreferencesGetValue(std::string_view key,
                                                     std::string_view domain) {
  if (!isValidDomain(domain)) return {};
  Domain& entry = domainNamed(domain);
  if (const auto change = entry.changes.find(key); change != entry.changes.end()) {
    return plist::deepCopy(change->second);
  }
  return plist::deepCopy(storedOf(entry, domain).get(key));
}

void FilePreferences::ZTXPreferencesSetValue(std::string_view key, const plist::Value& value,
                                             std::string_view domain) {
  if (!isValidDomain(domain)) {
    log_.log(LogLevel::Error,
             "cannot set preference %s: %s is not the name of a domain; use 1 to %d characters, "
             "no slash or control character, and no dot in front",
             quotedText(key.substr(0, limits::kPreferenceDomainBytes)),
             quotedText(domain.substr(0, limits::kPreferenceDomainBytes)),
             static_cast<int>(limits::kPreferenceDomainBytes));
    return;
  }
  domainNamed(domain).changes.insert_or_assign(std::string(key), plist::deepCopy(value));
}

bool FilePreferences::ZTXPreferencesSynchronize(std::string_view domain) {
  return isValidDomain(domain) && synchronize(domainNamed(domain), domain);
}

Expected<std::vector<std::string>> FilePreferences::domains() {
  auto names = files_.list(folder_);
  if (!names) return names;
  std::erase_if(*names, [](const std::string& name) { return !name.ends_with(kEnding); });
  for (std::string& name : *names)
    name.resize(name.size() - kEnding.size());
  // With the ending, "a-b" came before "a".
  std::ranges::sort(*names);
  return names;
}

plist::Dictionary FilePreferences::values(std::string_view domain) {
  if (!isValidDomain(domain)) return {};
  Domain& entry = domainNamed(domain);
  plist::Dictionary merged = plist::mutableCopy(storedOf(entry, domain));
  for (const auto& [key, value] : entry.changes)
    merged.set(key, value);
  return plist::deepCopy(merged).dictionary();
}

Expected<plist::Dictionary> FilePreferences::storedValues(std::string_view domain) {
  const std::string path = pathOf(domain);
  auto content = readContent(path);
  if (!content) return content.error();
  if (content->fault.empty()) return content->values;
  return Error{"cannot read preferences " + path + ": " + content->fault + "; repair it"};
}

Expected<bool> FilePreferences::hasDamagedFile(std::string_view domain) {
  const auto names = files_.list(folder_);
  if (!names) return names.error();
  const std::string beginning = std::string(domain).append(kEnding).append(kSetAsideMark);
  return std::ranges::any_of(*names, [&](const std::string& name) {
    return name.starts_with(beginning) && !name.ends_with(kEnding);
  });
}

FilePreferences::Domain& FilePreferences::domainNamed(std::string_view domain) {
  const auto found = domains_.find(domain);
  return found != domains_.end() ? found->second : domains_[std::string(domain)];
}

std::string FilePreferences::pathOf(std::string_view domain) const {
  std::string path = folder_;
  path += '/';
  path += domain;
  path += kEnding;
  return path;
}

Expected<FilePreferences::Content> FilePreferences::readContent(const std::string& path) {
  auto bytes = files_.readIfPresent(path, limits::kPreferenceFileBytes);
  if (!bytes) return bytes.error();
  Content content;
  if (!*bytes) return content;
  content.bytes = *std::move(*bytes);
  auto value = propertyLists_.decode(asBytes(content.bytes));
  if (value) content.values = value->dictionary();
  if (!value || !content.values) {
    content.fault = value ? "it is not a dictionary" : value.error().message;
  }
  return content;
}

const plist::Dictionary& FilePreferences::storedOf(Domain& domain, std::string_view name) {
  if (domain.stored) return *domain.stored;
  const std::string path = pathOf(name);
  const auto content = readContent(path);
  std::string fault;
  if (!content) {
    fault = content.error().message;
  } else if (!content->fault.empty()) {
    fault = "cannot read preferences " + path + ": " + content->fault +
            "; repair it, or the next write sets it aside";
  }
  if (!fault.empty() && !domain.unreadableReported) log_.write(LogLevel::Error, fault);
  domain.unreadableReported = !fault.empty();
  domain.stored = content ? content->values : plist::Dictionary();
  return *domain.stored;
}

bool FilePreferences::synchronize(Domain& domain, std::string_view name) {
  if (domain.changes.empty()) {
    domain.stored.reset();
    return true;
  }
  if (Status written = writeChanges(domain, name); !written) {
    if (!domain.unwritableReported) log_.write(LogLevel::Error, written.error().message);
    domain.unwritableReported = true;
    return false;
  }
  domain.changes.clear();
  domain.unwritableReported = false;
  domain.unreadableReported = false;
  return true;
}

Status FilePreferences::writeChanges(Domain& domain, std::string_view name) {
  const std::string path = pathOf(name);
  const auto locked = files_.lockFile(folder_ + "/.lock");
  if (!locked) return locked.error();
  auto content = readContent(path);
  // A file that this process cannot read may be intact, so it is not replaced.
  if (!content) return content.error();
  if (!content->fault.empty()) {
    if (Status aside = setAside(path, content->fault); !aside) return aside;
    content->bytes.clear();
  }

  plist::Dictionary merged = plist::mutableCopy(content->values);
  for (const auto& [key, value] : domain.changes)
    merged.set(key, value);
  if (!merged) merged = plist::Dictionary::create();
  auto bytes = encodeWhatFits(domain, content->values, merged, name);
  if (!bytes) return Error{"cannot write preferences " + path + ": " + bytes.error().message};
  if (bytes->size() > limits::kPreferenceFileBytes) {
    return Error{"cannot write preferences " + path + ": they need " +
                 std::to_string(bytes->size()) + " bytes, and the limit is " +
                 std::to_string(limits::kPreferenceFileBytes) + "; remove some"};
  }
  // Skip writing equal bytes, to spare the flash, unless an earlier attempt may not have made them
  // durable.
  if (*bytes != content->bytes || domain.unwritableReported) {
    if (Status replaced = files_.replace(path, asBytes(*bytes), kMode); !replaced) return replaced;
  }
  domain.stored = merged;
  return Done{};
}

// A change that the file cannot hold, such as a not-a-number date or a huge text, must not keep the
// domain's other changes from being written.
Expected<std::string> FilePreferences::encodeWhatFits(Domain& domain,
                                                      const plist::Dictionary& stored,
                                                      plist::Dictionary& merged,
                                                      std::string_view name) {
  auto bytes = propertyLists_.encodeXml(merged);
  if (bytes && bytes->size() <= kLargestChange) return bytes;

  const auto drop = [&](const std::string& key, const std::string& why) {
    log_.log(LogLevel::Error, "cannot write preference %s of domain %s: %s; it is dropped",
             quotedText(key.substr(0, limits::kPreferenceDomainBytes)), name, why);
    merged.set(key, stored.get(key));
    domain.changes.erase(key);
  };
  std::vector<std::pair<std::size_t, std::string>> changes;  // bytes needed, key
  std::map<std::string, std::string> unfit;                  // key, reason
  for (const auto& [key, value] : domain.changes) {
    if (value.isNull()) continue;
    const auto alone = propertyLists_.encodeXml(plist::Dictionary{{key, value}});
    if (!alone) {
      unfit[key] = alone.error().message;
    } else if (alone->size() > kLargestChange) {
      unfit[key] = format("it needs %llu bytes; the limit is %llu", std::uint64_t{alone->size()},
                          std::uint64_t{kLargestChange});
    } else {
      changes.emplace_back(alone->size(), key);
    }
  }
  for (const auto& [key, why] : unfit)
    drop(key, why);
  if (!unfit.empty()) bytes = propertyLists_.encodeXml(merged);

  std::sort(changes.begin(), changes.end());
  while (bytes && bytes->size() > limits::kPreferenceFileBytes && !changes.empty()) {
    const std::string why =
        format("the file would have %llu bytes with it; the limit is %llu",
               std::uint64_t{bytes->size()}, std::uint64_t{limits::kPreferenceFileBytes});
    // Drop several at once: encoding again after each of many small changes would take for ever.
    std::size_t excess = bytes->size() - limits::kPreferenceFileBytes;
    while (excess > 0 && !changes.empty()) {
      const auto [size, key] = std::move(changes.back());
      changes.pop_back();
      drop(key, why);
      excess -= std::min(excess, size);
    }
    bytes = propertyLists_.encodeXml(merged);
  }
  return bytes;
}

Status FilePreferences::setAside(const std::string& path, std::string_view fault) {
  std::string aside = path;
  aside += kSetAsideMark;
  aside += compactStamp(clock_.now()) + "-" + randomName().substr(0, 4);
  if (Status moved = files_.rename(path, aside); !moved) return moved;
  log_.log(LogLevel::Error, "preferences %s could not be read (%s): moved to %s; a new file begins",
           path, fault, aside);
  return Done{};
}

}  // namespace tavrel
