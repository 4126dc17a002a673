#include "tests/fakes/fake_platform.h"

#include <algorithm>
#include <cerrno>
#include <functional>
#include <utility>

namespace tavrel::fakes {
namespace {

class FakeHistory : public BHHistory {
 public:
  explicit FakeHistory(FakeStore& store) : store_(store) {}

  bool scalarsForKeyPrefix(std::string_view prefix, std::int64_t min, std::int64_t max,
                           const ScalarRowHandler& handler) override {
    bool stop = false;
    for (const auto& [key, day, value] : store_.scalars) {
      if (key.starts_with(prefix) && day > min && day <= max) handler(key, day, value, stop);
    }
    return store_.scalarsAreReadable;
  }

  bool distributionsForKeyPrefix(std::string_view prefix, std::int64_t min, std::int64_t max,
                                 const DistributionRowHandler& handler) override {
    bool stop = false;
    for (const auto& [key, day, values] : store_.distributions) {
      if (!key.starts_with(prefix) || day <= min || day > max) continue;
      FakeDistribution enumerator(values);
      handler(key, day, enumerator, stop);
      if (enumerator.wasRead) store_.keysRead.insert(key);
    }
    return store_.distributionsAreReadable;
  }

 private:
  FakeStore& store_;
};

class FakeSnapshot : public StackSnapshot {
 public:
  explicit FakeSnapshot(FakeSnapshots& source) : source_(source) { ++source_.alive; }
  ~FakeSnapshot() override { --source_.alive; }

  bool setFlags(std::uint32_t flags) override {
    source_.flags = flags;
    return source_.takesFlags;
  }
  bool capture() override { return source_.captures; }
  std::optional<ByteSpan> buffer() override {
    return source_.hasBuffer ? std::optional<ByteSpan>(source_.content) : std::nullopt;
  }

 private:
  FakeSnapshots& source_;
};

class StringLogFile : public LogFile {
 public:
  void write(ByteSpan bytes) override { content += asText(bytes); }
  std::string content;
};

class FakeLibrary : public DynamicLibrary {
 public:
  explicit FakeLibrary(FakeLoader& loader) : loader_(loader) {}

  LibraryFunction find(std::string_view function) override {
    if (loader_.missing.contains(function)) return {};
    if (function == "ZTXPreferencesGetIntegerValue") {
      return IntegerPreferenceGetter([preferences = &loader_.preferences](auto key, auto domain) {
        return preferences->ZTXPreferencesGetIntegerValue(key, domain);
      });
    }
    return PreferenceSetter(
        std::bind_front(&Preferences::ZTXPreferencesSetValue, &loader_.preferences));
  }

 private:
  FakeLoader& loader_;
};

class FakeListener : public ServiceListener {
 public:
  FakeListener(FakeServices& services, std::string_view name) : services_(services), name_(name) {}
  void setPeerHandler(PeerHandler handler) override { services_.peerHandler = std::move(handler); }
  void resume() override { services_.name = name_; }

 private:
  FakeServices& services_;
  std::string name_;
};

}  // namespace

SystemControls::Result FakeControls::read(std::string_view name, MutableByteSpan buffer) {
  if (name == "kern.next_ecc_event") {
    if (eccEvents.empty()) return {errorBehindEvents, 0};
    const auto event = std::exchange(eccEvents.front(), {});
    eccEvents.pop_front();
    std::copy(event.begin(), event.end(), buffer.begin());
    return {0, event.size()};
  }
  const auto at = values.find(name);
  if (at == values.end()) return {ENOENT, 0};
  if (at->second.size() > buffer.size()) return {ENOMEM, 0};
  std::copy(at->second.begin(), at->second.end(), buffer.begin());
  return {0, at->second.size()};
}

std::unique_ptr<DynamicLibrary> FakeLoader::load(std::string_view) {
  ++loads;
  if (!isPresent) return nullptr;
  return std::make_unique<FakeLibrary>(*this);
}

std::unique_ptr<ServiceListener> FakeServices::createListener(std::string_view serviceName) {
  if (!available) return nullptr;
  return std::make_unique<FakeListener>(*this, serviceName);
}

std::unique_ptr<BHHistory> FakeStore::initWithDefaultPath() {
  return std::make_unique<FakeHistory>(*this);
}

bool FakeSubmission::ZTXWriteLogForSubmission(std::string_view type, std::string_view name,
                                              const plist::Dictionary& options,
                                              const LogWriter& writer) {
  journal.push_back("write log");
  if (fails) return false;
  StringLogFile file;
  writer(file);
  logs.push_back({std::string(type), std::string(name), options, file.content});
  return true;
}

void FakePlatform::setWhitelist(const plist::Dictionary& groups) {
  files.contents["/Library/Application Support/Brimhold/Whitelist_Pellio.plist"] =
      *propertyLists.encodeXml(groups);
}

std::unique_ptr<StackSnapshot> FakeSnapshots::create() {
  return creates ? std::make_unique<FakeSnapshot>(*this) : nullptr;
}

}  // namespace tavrel::fakes
