#include <dlfcn.h>
#include <netdb.h>
#include <regex>
#include <sys/file.h>
#include <zlib.h>

#include "platform/linux/files/random.h"
#include "servers.h"
#include "tests/platform/device_services.h"
#include "tests/system/killed_process.h"
#include "upload/network.h"
#include "upload/uploader.h"

// Stands in for the C library's: the look-up of one name never ends.
extern "C" int getaddrinfo(const char* node, const char* service, const addrinfo* hints,
                           addrinfo** result) {
  if (node != nullptr && std::string_view(node) == "hangs.example") pause();
  using Original = decltype(&getaddrinfo);
  static const auto kOriginal = reinterpret_cast<Original>(dlsym(RTLD_NEXT, "getaddrinfo"));
  return kOriginal(node, service, hints, result);
}

namespace tavrel {
namespace {

using upload::Outcome;
namespace fs = std::filesystem;

const std::string kSubmission = "/var/mobile/Library/Logs/Submission/";
const std::string kOutbox = kSubmission + "outbox/";

std::string status(const std::string& line, const std::string& headers = {}) {
  return "HTTP/1.1 " + line + "\r\n" + headers + "Content-Length: 0\r\n\r\n";
}
const std::string kOk = status("201 Created", "Tavrel-Received: DIGEST\r\n");

std::string nameOf(int number) {
  return format("log-tallied-20261127T18%02d%02dZ-5f0c9a1e", number / 60, number % 60);
}

// As HTTP writes dates.
std::string dateAfter(int seconds) {
  const std::time_t time = std::time(nullptr) + seconds;
  char text[64];
  std::strftime(text, sizeof text, "%a, %d %b %Y %H:%M:%S GMT", std::gmtime(&time));
  return text;
}

std::string gunzipped(const std::string& path) {
  const std::unique_ptr<gzFile_s, int (*)(gzFile)> file(gzopen(path.c_str(), "rb"), gzclose);
  char text[4096];
  return {text, static_cast<std::size_t>(std::max(0, gzread(file.get(), text, sizeof text)))};
}

struct Device : DeviceServices {
  Device() { permit("<true/>"); }

  void permit(const std::string& value) const {
    write("/var/mobile/Library/Preferences/com.norvane.zentrix.plist",
          "<plist version=\"1.0\"><dict><key>DiagnosticSubmissionEnabled</key>" + value +
              "</dict></plist>");
  }
  void configure(const std::string& settings) const {
    write(upload::kConfigurationPath,
          "<plist version=\"1.0\"><dict>" + settings + "</dict></plist>");
  }
  void add(const std::string& name, const std::string& place = "outbox/",
           std::string_view version = "Pellio 4.2 (16R349)") {
    const plist::Dictionary metadata{{"LogType", "193"},
                                     {"LogName", "log-tallied"},
                                     {"OSVersion", version},
                                     {"Time", clock.time},
                                     {"Options", plist::Dictionary{{"a&b", "x y"}, {"c", 7}}}};
    write(kSubmission + place + name + ".metadata.plist", *coding.encodeXml(metadata));
    write(kSubmission + place + name + ".log", "content of " + name);
  }
  Lines names(const std::string& place = "outbox") {
    return *files.list(root.path(kSubmission + place));
  }
  upload::State state() {
    return upload::readState(files, coding, log, root.path(upload::kStatePath));
  }
  Outcome run(bool atOnce = false) {
    LinuxSystemVersion version(root, files, coding, log);
    FileSubmission submission(root, files, coding, preferences, version, clock, log);
    return upload::Uploader({root, files, coding, preferences, submission, clock, log},
                            configuration)
        .run(atOnce);
  }
  Outcome runAgainst(const ScriptedServer& server, bool atOnce = false) {
    configuration.url = server.url();
    configuration.host = "127.0.0.1";
    configuration.mayBePlain = true;
    return run(atOnce);
  }
  void use(const std::string& url, const std::string& folder, const std::string& authority,
           const std::string& certificate) {
    configuration.url = url;
    configuration.host = "127.0.0.1";
    configuration.authority = folder + authority + ".crt";
    configuration.certificate = certificate.empty() ? "" : folder + certificate + ".crt";
    configuration.key = certificate.empty() ? "" : folder + certificate + ".key";
  }
  upload::Configuration configuration;
};

TEST(Upload, SendsAllToNginxOldestFirst) {
  Nginx nginx;
  Device device;
  const std::string server = format("https://127.0.0.1:%d/logs", nginx.port);
  for (const int number : {61, 3, 7})
    device.add(nameOf(number));
  device.add(nameOf(5), "pending/", "4\r\nEvil: 1 \xC3\xA9 100%");
  device.write(kOutbox + nameOf(9) + ".metadata.plist", "its log is gone");
  const std::tuple<std::string, const char*, const char*, std::string> faults[] = {
      {server, "ca", "", nameOf(3) + ": the server answers 400; next attempt"},
      {server, "ca", "other", "the server answers 400"},
      {server, "other", "device", "SSL certificate problem"},
      {format("https://localhost:%d/logs", nginx.port), "ca", "device",
       "no alternative certificate subject name matches"},
      {server + "s", "ca", "device", "the server answers 404: check URL"}};
  for (const auto& [url, authority, certificate, why] : faults) {
    device.use(url, nginx.folder, authority, certificate);
    EXPECT_EQ(device.run(true), Outcome::Waits);
    EXPECT_NE(device.log.lines.back().find(why), std::string::npos) << device.log.lines.back();
  }
  EXPECT_EQ(device.state().failedAttempts, 5);
  EXPECT_EQ(device.names().size(), 8U);

  device.use(server, nginx.folder, "ca", "device");
  EXPECT_EQ(device.run(true), Outcome::Done);
  EXPECT_EQ(device.log.lines.back(), "logs sent: 4, refused by the server: 0");
  device.add(nameOf(7));  // as when the answer was lost
  EXPECT_EQ(device.run(), Outcome::Done);
  EXPECT_EQ(device.names(), Lines{});
  std::string expected;
  for (const int number : {3, 5, 7, 61, 8}) {
    const std::string name = nameOf(number == 8 ? 7 : number);
    EXPECT_EQ(gunzipped(nginx.folder + "srv/device-7/" + name + ".log.gz"), "content of " + name);
    expected += format(
        R"({"device":"device-7","log":"%s.log","status":%d,"type":"193","name":"log-tallied",)"
        R"("os_version":"%s","filed":"2026-11-27T18:02:18Z","options":"a%%26b=x y&c=7"})",
        name, number == 8 ? 204 : 201,
        number == 5 ? "4%0D%0AEvil: 1 %C3%A9 100%25" : "Pellio 4.2 (16R349)");
  }
  EXPECT_EQ(std::regex_replace(nginx.accessLog(), std::regex("\"time\":\"[^\"]*\",|\n"), ""),
            expected);
  const upload::State state = device.state();
  EXPECT_EQ(std::tuple(state.sent, state.refused, state.failedAttempts, state.failure),
            std::tuple(5, 0, 0, ""));
  EXPECT_EQ(state.lastSuccess, plist::Date::since1970(1'795'802'538));
  EXPECT_FALSE(state.nextAttempt);
}

TEST(Upload, KeepsTheLogWhateverIsAnswered) {
  const std::string portal =
      " without Tavrel-Received and the log's digest: is this the log server, or a portal of the "
      "network?";
  const std::string received = "Tavrel-Received: DIGEST\r\n";
  const std::string busy = "503 Busy\r\nRetry-After: ";
  const std::string ends = "the server answers ";
  // The answer, what is said of it, and the shortest and the longest pause.
  const std::tuple<std::string, std::string, double, double> cases[] = {
      {"200 OK\r\nContent-Length: 5\r\n\r\nhello", ends + "200" + portal, 300, 600},
      {"201 Created\r\nTavrel-Received: sha-256=:bw==:\r\n", ends + "201" + portal, 300, 600},
      {"202 Accepted\r\n" + received, ends + "202", 300, 600},
      {"302 Found\r\nLocation: http://portal.example/\r\n",
       ends + "302 and points to http://portal.example/: redirects are not followed; mend URL", 300,
       600},
      {"401 No\r\n", ends + "401: check the certificate or the token", 300, 600},
      {"403 No\r\n", ends + "403: check the certificate or the token", 300, 600},
      {busy + "7200\r\n", ends + "503", 7200, 7920},
      {busy + dateAfter(7200) + "\r\n", ends + "503", 7190, 7920},
      {busy + "Fri, 31 Dec 9999 23:59:59 GMT\r\n", ends + "503", 21'599, 86'400},
      {busy + "99999999999999999999\r\n", ends + "503", 300, 86'400},
      {"201 Created\r\n" + received + "Content-Length: 9\r\n\r\ncut",
       "transfer closed with 6 bytes remaining to read", 300, 600},
      {"201 Created\r\n" + received + "\r\n" + std::string(70'000, 'x'), "the answer is too long",
       300, 600},
      {"", "Empty reply from server", 300, 600}};
  for (const auto& [answer, why, shortest, longest] : cases) {
    SCOPED_TRACE(answer.substr(0, 100));
    Device device;
    device.add(nameOf(1));
    device.add(nameOf(2));
    const bool hasBody = answer.find("\r\n\r\n") != answer.npos;
    const std::string text =
        answer.empty() ? "" : "HTTP/1.1 " + answer + (hasBody ? "" : "Content-Length: 0\r\n\r\n");
    ScriptedServer server([&](const std::string&) { return text; });
    server.closesAfterAnswer = hasBody;
    EXPECT_EQ(device.runAgainst(server), Outcome::Waits);
    EXPECT_EQ(device.names().size(), 4U);
    const upload::State state = device.state();
    EXPECT_EQ(state.failure, "cannot send log " + nameOf(1) + ": " + why);
    EXPECT_EQ(state.failedAttempts, 1);
    const double wait = state.nextAttempt.value_or(device.clock.time) - device.clock.time;
    EXPECT_GE(wait, shortest - 1);  // the state has whole seconds
    EXPECT_LE(wait, longest);
    const int connections = server.connections;
    EXPECT_EQ(device.run(), Outcome::Waits);
    EXPECT_EQ(server.connections, connections) << "not before its time";
    device.clock.time = plist::Date::since1970(0);
    EXPECT_EQ(device.run(), Outcome::Waits);
    EXPECT_GT(server.connections, connections) << "another clock";
  }
  Device device;
  std::string noise(8 << 20, '\0');
  fillRandom(std::as_writable_bytes(std::span(noise)));
  device.write(kOutbox + nameOf(1) + ".log", noise);
  ScriptedServer server([](const std::string&) { return ""; });
  server.readsWhole = false;
  EXPECT_EQ(device.runAgainst(server), Outcome::Waits);
  EXPECT_EQ(device.names(), Lines{nameOf(1) + ".log"});
}

TEST(Upload, GivesUpWhatTheServerRefusesAndKeepsTheNewest) {
  Device device;
  for (int number = 0; number < 20; ++number)
    device.add(nameOf(number));
  device.write(kOutbox + nameOf(30) + ".log", std::string((4 << 20) - 500, 'x'));
  ScriptedServer server([&](const std::string& request) {
    if (request.find(nameOf(3)) != request.npos) return kOk;
    return status(request.find(nameOf(4)) != request.npos ? "413 Large" : "422 Unfit");
  });
  EXPECT_EQ(device.runAgainst(server), Outcome::Done);
  EXPECT_EQ(device.names(), Lines{});
  EXPECT_EQ(server.connections, 1);
  EXPECT_TRUE(device.log.says("the server refuses log " + nameOf(4) + " (413): it is kept in "));
  EXPECT_EQ(device.state().sent, 1);
  EXPECT_EQ(device.state().refused, 20);
  // 4 MiB hold few beside the large one; metadata stays with each.
  EXPECT_EQ(device.names("refused").size(), 1 + 2 * 10);
  device.add(nameOf(40));
  fs::remove(device.root.path(kSubmission + "refused/" + nameOf(30) + ".log"));
  for (int number = 41; number < 60; ++number)
    device.add(nameOf(number));
  EXPECT_EQ(device.run(), Outcome::Done);
  EXPECT_EQ(device.names("refused").size(), 2 * 16U);
  EXPECT_EQ(device.names("refused")[0], nameOf(44) + ".log");
}

TEST(Upload, AsksThePermissionBeforeAndDuringEachTransfer) {
  for (const std::string value : {"<false/>", "<string>yes</string>", ""}) {
    Device device;
    device.add(nameOf(1), "pending/");
    for (int number = 2; number < 5; ++number)
      device.add(nameOf(number));
    int requests = 0;
    ScriptedServer server([&](const std::string&) {
      device.permit(value);
      ++requests;
      return kOk;
    });
    const bool isWithdrawn = value == "<false/>";
    EXPECT_EQ(device.runAgainst(server), isWithdrawn ? Outcome::Done : Outcome::Waits);
    EXPECT_EQ(requests, 1);
    EXPECT_EQ(device.names().size(), isWithdrawn ? 0U : 6U);
    device.add(nameOf(9), "pending/");
    EXPECT_EQ(device.run(), Outcome::Done);
    EXPECT_EQ(requests, 1);
    EXPECT_EQ(device.names("pending").size(), isWithdrawn ? 0U : 2U);
  }
  Device device;
  device.add(nameOf(1));
  ScriptedServer server([&](const std::string&) {
    device.permit("<false/>");
    return "HTTP/1.1 100 Continue\r\n\r\n";  // and no more
  });
  EXPECT_EQ(device.runAgainst(server), Outcome::Done);
  EXPECT_EQ(device.names(), Lines{});
  EXPECT_EQ(device.log.lines,
            Lines{"the permission to send logs is withdrawn: 1 that waited are removed"});
}

TEST(Upload, LosesNoLogThatChangesMeanwhile) {
  Device device;
  for (int number = 1; number < 5; ++number)
    device.add(nameOf(number));
  device.write(kOutbox + "other name.log", "not ours");
  const auto pathOf = [&](int number) {
    return device.root.path(kOutbox + nameOf(number) + ".log");
  };
  int requests = 0;
  ScriptedServer server([&](const std::string&) {
    if (++requests > 1) return kOk;
    std::ofstream(pathOf(1), std::ios::app) << "more";
    fs::remove(pathOf(3));
    device.add(nameOf(0));
    return kOk;
  });
  EXPECT_EQ(device.runAgainst(server), Outcome::Failed);
  EXPECT_TRUE(device.log.says("log " + nameOf(1) + " was changed while it was sent"));
  EXPECT_TRUE(device.log.says("other name.log: its name is none that the system gives; remove it"));
  EXPECT_EQ(device.names(), Lines{"other name.log"}) << "the changed one was sent by another pass";
  EXPECT_EQ(requests, 5);

  const Descriptor lock(open(device.root.path("/var/lib/tavrel/upload/lock").c_str(), O_RDWR));
  ASSERT_EQ(flock(lock.get(), LOCK_EX | LOCK_NB), 0);
  device.add(nameOf(1));
  device.log.lines.clear();
  EXPECT_EQ(device.run(), Outcome::Done) << "while another uploader is at work";
  EXPECT_EQ(device.log.lines, Lines{});
  EXPECT_EQ(requests, 5);
}

TEST(Upload, HasADeadlineForEverything) {
  using std::chrono::seconds;
  Device device;
  device.add(nameOf(1));
  device.configuration.stall = seconds(1);
  ScriptedServer silent([](const std::string&) { return "H"; });
  EXPECT_EQ(device.runAgainst(silent), Outcome::Waits);
  EXPECT_TRUE(
      device.log.says("Operation too slow. Less than 100 bytes/sec transferred the last 1 "));
  device.configuration.stall = seconds(60);
  for (auto* const limit : {&device.configuration.transfer, &device.configuration.run}) {
    *limit = seconds(1);
    device.log.lines.clear();
    EXPECT_EQ(device.run(true), Outcome::Waits);
    EXPECT_TRUE(device.log.says("Operation timed out after 1"));
    *limit = seconds(600);
  }
  device.configuration.url = "http://hangs.example/logs";
  device.configuration.connect = seconds(1);
  // In a process of its own: the look-up never ends.
  EXPECT_EQ(inChild([&] {
              return device.run(true) == Outcome::Waits &&
                             device.log.says("Resolving timed out after 1")
                         ? 0
                         : 1;
            }),
            0);
  EXPECT_EQ(device.names().size(), 2U);
}

TEST(Upload, LosesNothingWhenItIsKilled) {
  std::set<std::string> arrived;
  ScriptedServer server([&](const std::string& request) {
    const std::size_t at = request.find("log-tallied-");
    arrived.insert(request.substr(at, nameOf(1).size()));
    return arrived.size() == 2 ? status("422 Unfit") : kOk;
  });
  bool isKilled = true;
  for (std::size_t calls = 20; isKilled; calls += 9) {
    SCOPED_TRACE(calls);
    Device device;
    arrived.clear();
    device.add(nameOf(1), "pending/");
    device.add(nameOf(2));
    isKilled = runUntilSystemCall(calls, [&] { device.runAgainst(server); });
    const Lines left = device.names();
    for (const int number : {1, 2}) {
      const std::string file = nameOf(number) + ".log";
      const auto isIn = [&](const Lines& names) {
        return std::find(names.begin(), names.end(), file) != names.end();
      };
      EXPECT_TRUE(isIn(left) || isIn(device.names("pending")) || arrived.contains(nameOf(number)));
    }
    EXPECT_NE(device.runAgainst(server, true), Outcome::Failed);
    EXPECT_EQ(device.names(), Lines{});
    EXPECT_EQ(arrived.size(), 2U);
    for (const std::string& name : device.names("refused"))
      EXPECT_TRUE(name.ends_with(".plist") || device.names("refused").size() == 2) << name;
  }
}

TEST(Upload, WaitsForANetworkThatMayBeUsed) {
  const auto row = [](const char* name, const char* to, const char* flags, int metric) {
    return format("%s\t%s\t0100A8C0\t%s\t0\t0\t%d\t00000000\t0\t0\t0\n", name, to, flags, metric);
  };
  const std::string zero(32, '0');
  const auto row6 = [&](const std::string& rest) {
    return zero + " 00 " + zero + " 00 " + zero + " " + rest + "\n";
  };
  const std::string head =
      "Iface\tDestination\tGateway\tFlags\tRefCnt\tUse\tMetric\tMask\tM\tW\tI\n";
  const std::string lan = row("eth0", "0000A8C0", "0001", 0);
  const std::string eth = row("eth0", "00000000", "0003", 100);
  const std::string down = row("wwan0", "00000000", "0002", 1);
  const std::string rejected = row6("ffffffff 00000001 00000000 00200200 lo");
  const std::tuple<std::string, std::string, std::string> cases[] = {
      {head + lan + down, rejected, "there is no default route"},
      {head + lan + down + eth, rejected, ""},
      {head + eth + row("wwan0", "00000000", "0003", 50), "", "the network is metered (wwan0)"},
      {head, row6("00000400 1 0 00000003 wwan1"), "the network is metered (wwan1)"},
      {"garbage\n\n" + eth.substr(0, 20), "x", "there is no default route"}};
  Device device;
  device.add(nameOf(1));
  device.configuration.meteredInterfaces = {"ppp0", "wwan*"};
  const auto reason = [&](const char* host) {
    device.configuration.host = host;
    return upload::reasonToWait(device.root, device.files, device.configuration);
  };
  for (const auto& [four, six, expected] : cases) {
    device.write("/proc/net/route", four);
    device.write("/proc/net/ipv6_route", six);
    EXPECT_EQ(reason("logs.example.com"), expected);
    for (const char* host : {"127.0.0.1", "localhost", "::1"})
      EXPECT_EQ(reason(host), "") << host;
  }
  device.configuration.host = "127.evil.example";
  EXPECT_EQ(device.run(), Outcome::Waits);
  EXPECT_EQ(device.log.lines, Lines{"logs wait: there is no default route"});
  EXPECT_FALSE(fs::exists(device.root.path(upload::kStatePath)));
}

TEST(Upload, PausesLongerFromFailureToFailure) {
  const std::tuple<std::int64_t, std::int64_t, double, double> cases[] = {
      {1, 0, 0, 300},     {1, 0, 1, 600},     {2, 0, 1, 1200},
      {8, 0, 0, 38400},   {9, 0, 1, 86400},   {INT64_MAX, 0, 1, 86400},
      {1, 1000, 0, 1000}, {1, 1000, 1, 1100}, {1, 86400, 1, 86400}};
  for (const auto& [failures, wish, chance, pause] : cases)
    EXPECT_EQ(upload::pauseSeconds(failures, wish, chance), pause) << failures << ' ' << wish;
}

TEST(Upload, SaysWhatIsWrongWithItsConfiguration) {
  Device device;
  const std::string at = device.root.path(upload::kConfigurationPath);
  const auto configured = [&](const std::string& settings) {
    device.configure(settings);
    return upload::readConfiguration(device.root, device.files, device.coding,
                                     device.root.path("/credentials"));
  };
  const std::string url = "<key>URL</key><string>";
  const std::string noUrl = "URL is not an address: give https://HOST/FOLDER";
  const std::string more =
      "URL has more than a host and a path: leave out user, query and fragment";
  const std::string noTime = " is not a time: give an integer from 1 to 86400 seconds";
  const std::pair<std::string, std::string> cases[] = {
      {"", "URL is missing: give https://HOST/FOLDER"},
      {url + "http://a</string>",
       "URL begins with http: use https, or set AllowPlainHTTP in a laboratory"},
      {url + "ftp://a/b</string>", noUrl},
      {url + "https://a /b</string>", noUrl},
      {url + "https://u@a/b</string>", more},
      {url + "https://a/b?c</string>", more},
      {"<key>Url</key><string/>", "Url is not a setting: see tavrel-upload(8)"},
      {"<key>StallSeconds</key><integer>0</integer>", "StallSeconds" + noTime},
      {"<key>RunSeconds</key><real>5</real>", "RunSeconds" + noTime},
      {"<key>AllowPlainHTTP</key><integer>1</integer>",
       "AllowPlainHTTP is not a boolean: give true or false"},
      {"<key>MeteredInterfaces</key><array><true/></array>",
       "MeteredInterfaces is not an array of names: give strings like wwan*"}};
  for (const auto& [settings, why] : cases)
    EXPECT_EQ(configured(settings).error().message, "cannot use " + at + ": " + why) << settings;
  const std::string good = url + "https://[::1]:8443/a/</string>";
  EXPECT_EQ(configured(good)->host, "::1");
  EXPECT_EQ(configured(good)->url, "https://[::1]:8443/a");
  device.write("/credentials/tavrel-upload.token", "two words\n");
  EXPECT_EQ(configured(good).error().message,
            "cannot use the credential tavrel-upload.token: a token has letters, digits and "
            "-._~+/= on one line");
  device.write("/credentials/tavrel-upload.token", "Abc-1==\n");
  device.configuration.token = configured(good)->token;
  device.write("/credentials/tavrel-upload.key", "k");
  EXPECT_EQ(configured(good).error().message,
            "cannot use the client certificate: the credential tavrel-upload.certificate is "
            "missing: give both");
  std::string authorization;
  ScriptedServer server([&](const std::string& request) {
    authorization = ScriptedServer::valueOf(request, "Authorization");
    return kOk;
  });
  device.add(nameOf(1));
  EXPECT_EQ(device.runAgainst(server), Outcome::Done);
  EXPECT_EQ(authorization, "Bearer Abc-1==");
}

TEST(Upload, TellsTheServiceManagerHowItEnded) {
  Device device;
  device.configure(
      "<key>URL</key><string>http://127.0.0.1:1/</string><key>AllowPlainHTTP</key><true/>");
  const auto run = [&](const std::string& arguments, const std::string& below = "/") {
    const std::string command = "TAVREL_ROOT=" + device.root.path(below) + " " TAVREL_UPLOAD " " +
                                arguments + " >/dev/null 2>&1";
    return WEXITSTATUS(std::system(command.c_str()));  // NOLINT(cert-env33-c)
  };
  EXPECT_EQ(run(""), 0) << "nothing to do";
  device.add(nameOf(1), "pending/");
  for (const char* arguments : {"", "--now", ""})
    EXPECT_EQ(run(arguments), 75);
  EXPECT_EQ(device.state().failedAttempts, 2);
  for (const char* arguments : {"--then", "then"})
    EXPECT_EQ(run(arguments), 2);
  EXPECT_EQ(run("--version"), 0);
  EXPECT_EQ(run("", "/missing"), 1);
  device.configure("");
  EXPECT_EQ(run(""), 78);
}
}  // namespace
}  // namespace tavrel
