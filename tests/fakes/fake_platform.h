// An in-memory platform for tests: services that hold state, with public fields for setup and a
// record of the calls. Property lists are really encoded and decoded.
#pragma once

#include <algorithm>
#include <deque>
#include <exception>
#include <map>
#include <new>
#include <optional>
#include <set>
#include <string>
#include <utility>
#include <vector>

#include "base/text.h"
#include "platform/platform.h"
#include "platform/plist/coding.h"
#include "tests/helpers/plist_matching.h"

namespace tavrel::fakes {

/// Calls in their order, where the order matters.
using Journal = std::vector<std::string>;

struct FakeClock : Clock {
  plist::Date instant = plist::Date::ofDay(20000);
  std::uint64_t tickCount = 0;
  std::optional<TimeBase> base = TimeBase{1, 1};

  plist::Date now() override { return instant; }
  std::uint64_t ticks() override { return tickCount; }
  std::optional<TimeBase> timeBase() override { return base; }
};

struct FakeLog : SystemLog {
  std::vector<std::pair<LogLevel, std::string>> entries;

  void write(LogLevel level, std::string_view message) override {
    entries.emplace_back(level, message);
  }
  /// The messages at a level, or at all levels except debug.
  std::vector<std::string> messages(std::optional<LogLevel> level = {}) const {
    std::vector<std::string> texts;
    for (const auto& [entryLevel, text] : entries) {
      if (level ? entryLevel == *level : entryLevel != LogLevel::Debug) texts.push_back(text);
    }
    return texts;
  }
};

struct FakePreferences : Preferences {
  explicit FakePreferences(Journal& journalOfCalls) : journal(journalOfCalls) {}
  Journal& journal;
  std::map<std::string, plist::Dictionary, std::less<>> domains;
  std::optional<std::string> keyWithoutMemory;

  plist::Dictionary& domain(std::string_view name) {
    return domains.try_emplace(std::string(name), plist::Dictionary::create()).first->second;
  }
  plist::Value ZTXPreferencesGetValue(std::string_view key, std::string_view name) override {
    return plist::deepCopy(domain(name).get(key));
  }
  void ZTXPreferencesSetValue(std::string_view key, const plist::Value& value,
                              std::string_view name) override {
    if (key == keyWithoutMemory) throw std::bad_alloc();
    journal.push_back(format("%s %s %s", value ? "set" : "remove", name, key));
    domain(name).set(key, plist::deepCopy(value));
  }
  bool ZTXPreferencesSynchronize(std::string_view name) override {
    journal.push_back(format("synchronize %s", name));
    return true;
  }
};

struct FakeDistribution : BHHistoryDistributionEnumerator {
  explicit FakeDistribution(const std::vector<double>& values) {
    for (const double value : values)
      appendPacked(packed, offsets, {{{value, 0}}});
  }
  std::string packed, offsets;
  bool wasRead = false;
  bool fails = false;  // after the values

  DistributionBlock nextBlock(bool) override {
    if (!std::exchange(wasRead, true)) return {packed, offsets};
    if (fails) fail();
    return {};
  }
};

struct FakeStore : StatisticsStore {
  explicit FakeStore(Journal& journalOfCalls) : journal(journalOfCalls) {}
  Journal& journal;
  std::int32_t today = 20000;
  std::vector<std::tuple<std::string, std::int32_t, std::int64_t>> scalars;
  std::vector<std::tuple<std::string, std::int32_t, std::vector<double>>> distributions;
  std::set<std::string> keysRead;  // distributions whose values were read
  bool keepsValues = true;
  bool scalarsAreReadable = true, distributionsAreReadable = true;
  int daysAsked = 0;

  std::int32_t BHDaysSince1970() override {
    ++daysAsked;
    return today;
  }
  plist::Date dateForDaysSince1970(std::int32_t day) override { return plist::Date::ofDay(day); }
  bool BHClientCheckpoint() override {
    journal.push_back("checkpoint");
    return keepsValues;
  }
  void BHClientSetValueForScalarKey(std::string_view key, std::int64_t value) override {
    journal.push_back(format("scalar %s", key));
    scalars.emplace_back(key, today, value);
  }
  std::unique_ptr<BHHistory> initWithDefaultPath() override;
};

struct FakeSubmission : SubmissionService {
  explicit FakeSubmission(Journal& journalOfCalls) : journal(journalOfCalls) {}
  struct Log {
    std::string type, name;
    plist::Dictionary options;
    std::string content;
  };
  Journal& journal;
  bool enabled = true;
  bool permissionReadable = true;
  bool fails = false;
  std::string osVersion = "Pellio 7.1 (21A5)";
  std::set<std::string, std::less<>> internalDiagnostics;
  plist::Dictionary taskingValues = plist::Dictionary::create();
  std::vector<Log> logs;

  bool isDiagnosticSubmissionEnabled() override { return enabled; }
  bool isPermissionReadable() override { return permissionReadable; }
  bool hasInternalDiagnostics(std::string_view identifier) override {
    return internalDiagnostics.contains(identifier);
  }
  bool ZTXWriteLogForSubmission(std::string_view type, std::string_view name,
                                const plist::Dictionary& options, const LogWriter& writer) override;
  std::string ZTXOSVersion() override { return osVersion; }
  plist::Value ZTXGetDATaskingValue(std::string_view key) override {
    return taskingValues.get(key);
  }
  void submitDiagnosticLogs() override { journal.push_back("submit now"); }

  /// The last log, read back.
  plist::Dictionary lastLog() const {
    if (logs.empty()) return {};
    const auto value = plist::PlistCoding().decode(asBytes(logs.back().content));
    return value ? value->dictionary() : plist::Dictionary();
  }
};

struct FakeCrashReporting : CrashReporting {
  explicit FakeCrashReporting(Journal& journalOfCalls) : journal(journalOfCalls) {}
  Journal& journal;
  std::vector<std::pair<std::uint32_t, plist::Dictionary>> records;

  void FLLogStructuredData(std::uint32_t type, const plist::Dictionary& record) override {
    records.emplace_back(type, record);
  }
  void FLDumpAllOldStructuredDataLogs() override { journal.push_back("clean structured logs"); }
  void rollNorvaneCareLogs() override { journal.push_back("roll support log"); }
  std::string systemIdentifier() override { return "system-id"; }
  std::string hardwareModel() override { return "Model1,1"; }
  std::string osVersion() override { return "Pellio 7.1 (21A5)"; }
  std::string incidentIdentifier() override { return "incident-id"; }
};

struct FakeAnswers : DeviceAnswers {
  plist::Dictionary answers = plist::Dictionary::create();
  std::vector<std::string> questions;

  plist::Value SQCopyAnswer(std::string_view question) override {
    questions.emplace_back(question);
    return answers.get(question);
  }
};

/// Counts up from 0 whatever the bytes are.
struct FakeDigest : Digest {
  std::array<std::byte, 16> md5(ByteSpan) override {
    std::array<std::byte, 16> digest{};
    for (std::size_t i = 0; i < digest.size(); ++i)
      digest[i] = static_cast<std::byte>(i);
    return digest;
  }
};

struct FakeFileReader : FileReader {
  std::map<std::string, std::string, std::less<>> contents;

  Expected<std::string> read(std::string_view path, std::size_t largest) override {
    const auto at = contents.find(path);
    if (at == contents.end()) return Error{"no such file"};
    if (at->second.size() > largest) return Error{"too large"};
    return at->second;
  }
  std::optional<std::int64_t> size(std::string_view path) override {
    const auto content = read(path, SIZE_MAX);
    return content ? std::optional(static_cast<std::int64_t>(content->size())) : std::nullopt;
  }
};

struct FakeSystemVersion : SystemVersion {
  plist::Dictionary version{{kProductBuildVersionKey, "21A5"}};
  plist::Dictionary systemVersionDictionary() override { return version; }
};

/// Plays a list of events; every later slice runs out of time.
struct FakeEventLoop : EventLoop {
  std::deque<std::function<void()>> events;
  bool terminates = false;
  std::vector<std::chrono::milliseconds> slices;

  Slice runSlice(std::chrono::milliseconds longest) override {
    slices.push_back(longest);
    if (events.empty()) return terminates ? Slice::Terminated : Slice::TimedOut;
    const auto event = events.front();
    events.pop_front();
    event();
    return Slice::HandledEvent;
  }
};

struct FakeApplications : PWApplicationWorkspace {
  std::vector<PWBundleProxy> bundles;
  int enumerations = 0;

  void enumerateBundles(std::uint32_t kind,
                        const std::function<void(const PWBundleProxy&)>& handler) override {
    ++enumerations;
    if (kind != kInstalledApplications) return;
    std::ranges::for_each(bundles, handler);
  }
};

struct FakeLocale : Locale {
  std::vector<std::string> preferred, matched;
  std::optional<std::string> country;

  std::vector<std::string> preferredLanguages() override { return preferred; }
  std::vector<std::string> systemLanguages() override { return {"en", "de"}; }
  std::vector<std::string> matchLocalizations(const std::vector<std::string>&,
                                              const std::vector<std::string>&) override {
    return matched;
  }
  std::optional<std::string> countryCode() override { return country; }
};

/// Controls with a value, and the answers of "kern.next_ecc_event"; no others exist.
struct FakeControls : SystemControls {
  std::map<std::string, std::vector<std::byte>, std::less<>> values;
  std::deque<std::vector<std::byte>> eccEvents;
  int errorBehindEvents = 2;  // no such entry

  Result read(std::string_view name, MutableByteSpan buffer) override;
};

struct FakeNotifications : Notifications {
  explicit FakeNotifications(Journal& journalOfCalls) : journal(journalOfCalls) {}
  Journal& journal;

  void post(std::string_view name) override { journal.push_back(format("post %s", name)); }
};

/// A library whose presence and functions can be switched off.
struct FakeLoader : DynamicLoader {
  explicit FakeLoader(Preferences& preferencesBehind) : preferences(preferencesBehind) {}
  Preferences& preferences;
  bool isPresent = true;
  std::set<std::string, std::less<>> missing;
  int loads = 0;

  std::unique_ptr<DynamicLibrary> load(std::string_view path) override;
};

/// Passes the test's peer to the listener.
struct FakeServices : NamedServices {
  struct Peer : PeerConnection {
    EventHandler handler;
    bool resumed = false;
    void setEventHandler(EventHandler newHandler) override { handler = std::move(newHandler); }
    void resume() override { resumed = true; }
  };
  bool available = true;
  std::string name;  // the service listened on, once its listener was resumed
  ServiceListener::PeerHandler peerHandler;

  std::unique_ptr<ServiceListener> createListener(std::string_view serviceName) override;
};

/// Dates in UTC, whatever the pattern.
struct FakeDateFormatting : DateFormatting {
  std::exception_ptr raises;

  std::string format(plist::Date date, std::string_view, std::string_view) override {
    if (raises) std::rethrow_exception(raises);
    return textOf(plist::Value(date));
  }
};

struct FakeProcess : Process {
  std::string name() override { return "tavrel"; }
  std::int32_t identifier() override { return 211; }
};

/// Keeps what was printed.
struct FakeStreams : StandardStreams {
  std::string output, error;
  void writeOutput(std::string_view text) override { output += text; }
  void writeError(std::string_view text) override { error += text; }
};

/// No drivers, or those of the registry `behind`.
struct FakeRegistry : DriverRegistry {
  DriverRegistry* behind = nullptr;

  std::shared_ptr<DriverService> firstService(std::string_view className) override {
    return behind ? behind->firstService(className) : nullptr;
  }
  KernelReturn matchingServices(const plist::Dictionary& matching,
                                std::unique_ptr<ServiceIterator>& services) override {
    return behind ? behind->matchingServices(matching, services) : kKernelNotFound;
  }
};

/// Captures `content`; each step can be made to fail.
struct FakeSnapshots : StackSnapshots {
  std::vector<std::byte> content;
  bool creates = true, takesFlags = true, captures = true, hasBuffer = true;
  std::uint32_t flags = 0;
  int alive = 0;  // configurations that were not released

  std::unique_ptr<StackSnapshot> create() override;
};

/// All fakes, and the `Platform` made of them.
struct FakePlatform {
  Journal journal;
  FakeApplications applications;
  FakeClock clock;
  FakeCrashReporting crashReporting{journal};
  FakeAnswers answers;
  FakeDigest digest;
  FakePreferences preferences{journal};
  FakeLoader loader{preferences};
  FakeEventLoop eventLoop;
  FakeFileReader files;
  FakeLocale locale;
  FakeLog log;
  FakeServices services;
  FakeNotifications notifications{journal};
  plist::PlistCoding propertyLists;
  FakeStore store{journal};
  FakeSubmission submission{journal};
  FakeControls controls;
  FakeSystemVersion systemVersion;
  FakeDateFormatting dateFormatting;
  FakeRegistry drivers;
  FakeProcess process;
  FakeSnapshots stackSnapshots;
  FakeStreams streams;
  ProcessState state;
  Platform platform{applications, clock,         crashReporting, dateFormatting, answers,
                    digest,       drivers,       loader,         eventLoop,      files,
                    locale,       log,           services,       notifications,  preferences,
                    process,      propertyLists, stackSnapshots, streams,        store,
                    submission,   controls,      systemVersion,  state};

  /// Puts a whitelist in its place.
  void setWhitelist(const plist::Dictionary& groups);
};

}  // namespace tavrel::fakes
