#include <dlfcn.h>
#include <netdb.h>
#include <sys/file.h>
#include <zlib.h>

#include "base/iso_date.h"
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
const std::string kOk =
    "HTTP/1.1 201 Created\r\nTavrel-Received: DIGEST\r\nContent-Length: 0\r\n\r\n";

std::string status(const std::string& line, const std::string& headers = {}) {
  return "HTTP/1.1 " + line + "\r\n" + headers + "Content-Length: 0\r\n\r\n";
}

std::string nameOf(int number) {
  return format("log-tallied-20261127T18%02d%02dZ-5f0c9a1e", number / 60, number % 60);
}

std::string gunzipped(const std::string& path) {
  const std::unique_ptr<gzFile_s, int (*)(gzFile)> file(gzopen(path.c_str(), "rb"), gzclose);
  std::string text(1 << 20, '\0');
  text.resize(static_cast<std::size_t>(std::max(0, gzread(file.get(), text.data(), 1 << 20))));
  return text;
}

struct Device : DeviceServices {
  Device() { permit("<true/>"); }

  void permit(const std::string& value) const {
    const std::string text = "<plist version=\"1.0\"><dict><key>DiagnosticSubmissionEnabled</key>" +
                             value + "</dict></plist>";
    write("/var/mobile/Library/Preferences/com.norvane.zentrix.plist", value.empty() ? "" : text);
  }
  void add(const std::string& name, std::string_view place = "outbox/",
           std::string_view version = "Pellio 4.2 (16R349)") {
    const plist::Dictionary metadata{{"LogType", "193"},
                                     {"LogName", "log-tallied"},
                                     {"OSVersion", version},
                                     {"Time", clock.time},
                                     {"Options", plist::Dictionary{{"a&b", "x y"}, {"c", 7}}}};
    const std::string path = kSubmission + std::string(place) + name;
    write(path + ".metadata.plist", *coding.encodeXml(metadata));
    write(path + ".log", "content of " + name);
  }
  Lines names(std::string_view place = "outbox") {
    return *files.list(root.path(kSubmission + std::string(place)));
  }
  Lines both(int number) { return {nameOf(number) + ".log", nameOf(number) + ".metadata.plist"}; }
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
  void useCertificate(const std::string& folder, const std::string& name) {
    configuration.certificate = folder + name + ".crt";
    configuration.key = folder + name + ".key";
  }
  upload::Configuration configuration;
};

TEST(Upload, SendsAllToNginxOldestFirst) {
  Nginx nginx;
  Device device;
  device.configuration.url = format("https://127.0.0.1:%d/logs", nginx.port);
  device.configuration.host = "127.0.0.1";
  device.configuration.authority = nginx.folder + "ca.crt";
  for (const int number : {61, 3, 7})
    device.add(nameOf(number));
  device.add(nameOf(5), "pending/", "4\r\nEvil: 1 \xC3\xA9 100%");
  device.write(kSubmission + "outbox/" + nameOf(9) + ".metadata.plist", "its log is gone");

  EXPECT_EQ(device.run(), Outcome::Waits);
  EXPECT_TRUE(device.log.says(nameOf(3) + ": the server answers 400; next attempt"))
      << "no certificate";
  device.useCertificate(nginx.folder, "other");
  EXPECT_EQ(device.run(true), Outcome::Waits);
  EXPECT_EQ(device.state().failedAttempts, 2);
  device.useCertificate(nginx.folder, "device");
  device.configuration.authority = nginx.folder + "other.crt";
  EXPECT_EQ(device.run(true), Outcome::Waits);
  EXPECT_TRUE(device.log.says("SSL certificate problem")) << "another authority";
  device.configuration.authority = nginx.folder + "ca.crt";
  device.configuration.url = format("https://localhost:%d/logs", nginx.port);
  EXPECT_EQ(device.run(true), Outcome::Waits);
  EXPECT_TRUE(device.log.says("no alternative certificate subject name matches")) << "another host";
  device.configuration.url = format("https://127.0.0.1:%d/log", nginx.port);
  EXPECT_EQ(device.run(true), Outcome::Waits);
  EXPECT_TRUE(device.log.says("the server answers 404: check URL"));
  EXPECT_EQ(device.names().size(), 8U);

  device.configuration.url = format("https://127.0.0.1:%d/logs", nginx.port);
  device.log.lines.clear();
  EXPECT_EQ(device.run(true), Outcome::Done);
  EXPECT_EQ(device.log.lines, Lines{"logs sent: 4, refused by the server: 0"});
  device.add(nameOf(7));  // as when the answer was lost
  EXPECT_EQ(device.run(), Outcome::Done);
  EXPECT_EQ(device.names(), Lines{});
  Lines expected;
  for (const int number : {3, 5, 7, 61, 7}) {
    EXPECT_EQ(gunzipped(nginx.folder + "srv/device-7/" + nameOf(number) + ".log.gz"),
              "content of " + nameOf(number));
    const char* version = number == 5 ? "4%0D%0AEvil: 1 %C3%A9 100%25" : "Pellio 4.2 (16R349)";
    expected.push_back(format(
        R"("device":"device-7","log":"%s.log","status":%d,"type":"193","name":"log-tallied",)"
        R"("os_version":"%s","filed":"2026-11-27T18:02:18Z","options":"a%%26b=x y&c=7"})",
        nameOf(number), expected.size() == 4 ? 204 : 201, version));
  }
  Lines access = nginx.accessLog();
  for (std::string& line : access)
    line.erase(0, line.find("\"device"));
  EXPECT_EQ(access, expected);
  const upload::State state = device.state();
  EXPECT_EQ(std::tuple(state.sent, state.refused, state.failedAttempts, state.failure),
            std::tuple(5, 0, 0, ""));
  EXPECT_EQ(state.lastSuccess, plist::Date::since1970(1'795'802'538));
  EXPECT_FALSE(state.nextAttempt);
}

TEST(Upload, KeepsTheLogWhateverIsAnswered) {
  const std::string notOurs =
      " without Tavrel-Received and the log's digest: is this the log "
      "server, or a portal of the network?";
  const std::tuple<std::string, std::string, double> cases[] = {
      // The answer, what is said of it, and the shortest pause.
      {"HTTP/1.1 200 OK\r\nContent-Length: 5\r\n\r\nhello", "the server answers 200" + notOurs,
       300},
      {status("201 Created", "Tavrel-Received: sha-256=:b3RoZXI=:\r\n"),
       "the server answers 201" + notOurs, 300},
      {status("202 Accepted", "Tavrel-Received: DIGEST\r\n"), "the server answers 202", 300},
      {status("302 Found", "Location: http://portal.example/\r\n"),
       "the server answers 302 and points to http://portal.example/: redirects are not followed; "
       "mend URL",
       300},
      {status("401 Unauthorized"), "the server answers 401: check the certificate or the token",
       300},
      {status("403 Forbidden"), "the server answers 403: check the certificate or the token", 300},
      {status("503 Busy", "Retry-After: 7200\r\n"), "the server answers 503", 7200},
      {status("503 Busy", "Retry-After: Fri, 31 Dec 9999 23:59:59 GMT\r\n"),
       "the server answers 503", 21599},
      {status("429 Often", "Retry-After: 99999999999999999999\r\n"), "the server answers 429", 300},
      {"HTTP/1.1 201 Created\r\nTavrel-Received: DIGEST\r\nContent-Length: 9\r\n\r\ncut",
       "transfer closed with 6 bytes remaining to read", 300},
      {"HTTP/1.1 201 Created\r\nTavrel-Received: DIGEST\r\n\r\n" + std::string(70000, 'x'),
       "the answer is too long", 300},
      {"", "Empty reply from server", 300},
  };
  for (const auto& [answer, why, pause] : cases) {
    SCOPED_TRACE(answer.substr(0, 200));
    Device device;
    device.add(nameOf(1));
    device.add(nameOf(2));
    const bool isCut = answer.find("cut") != answer.npos || answer.size() > 70000;
    std::string reply = answer;
    ScriptedServer server([&](const std::string&) {
      // The end of the connection ends these answers.
      return std::exchange(reply, isCut ? "" : reply);
    });
    if (isCut) server.closesAfterAnswer = true;
    EXPECT_EQ(device.runAgainst(server), Outcome::Waits);
    EXPECT_EQ(device.names().size(), 4U);
    const upload::State state = device.state();
    EXPECT_EQ(state.failure, "cannot send log " + nameOf(1) + ": " + why);
    EXPECT_EQ(state.failedAttempts, 1);
    ASSERT_TRUE(state.nextAttempt);
    const double wait = *state.nextAttempt - device.clock.time;
    EXPECT_GE(wait, pause);
    EXPECT_LE(wait, pause == 7200 ? 7921 : 86'400);
    const int connections = server.connections;
    EXPECT_EQ(device.run(), Outcome::Waits);
    EXPECT_EQ(server.connections, connections) << "not before its time";
    device.clock.time = plist::Date::since1970(0);
    EXPECT_EQ(device.run(), Outcome::Waits);
    EXPECT_GT(server.connections, connections) << "another clock";
  }
}

TEST(Upload, GivesUpWhatTheServerRefusesAndKeepsTheNewest) {
  Device device;
  for (int number = 0; number < 20; ++number)
    device.add(nameOf(number));
  device.write(kSubmission + "outbox/" + nameOf(30) + ".log", std::string((4 << 20) - 500, 'x'));
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
  device.write(kSubmission + "outbox/other name.log", "not ours");
  const std::string first = device.root.path(kSubmission + "outbox/" + nameOf(1) + ".log");
  int requests = 0;
  ScriptedServer server([&](const std::string&) {
    if (++requests == 1) {
      std::ofstream(first, std::ios::app) << "more";
      fs::remove(device.root.path(kSubmission + "outbox/" + nameOf(3) + ".log"));
      Device second;  // another process, on the same device
      upload::Uploader other({device.root, second.files, second.coding, second.preferences,
                              *std::make_unique<FileSubmission>(
                                  device.root, second.files, second.coding, second.preferences,
                                  *std::make_unique<LinuxSystemVersion>(device.root, second.files,
                                                                        second.coding, second.log),
                                  second.clock, second.log),
                              second.clock, second.log},
                             device.configuration);
      EXPECT_EQ(other.run(true), Outcome::Done);
      EXPECT_EQ(second.log.lines, Lines{});
      device.add(nameOf(0));  // the aggressive kind
    }
    return kOk;
  });
  EXPECT_EQ(device.runAgainst(server), Outcome::Failed);
  EXPECT_TRUE(device.log.says("log " + nameOf(1) + " was changed while it was sent"));
  EXPECT_TRUE(device.log.says("other name.log: its name is none that the system gives; remove it"));
  EXPECT_EQ(device.names(), Lines{"other name.log"}) << "the changed one was sent by the next pass";
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
  EXPECT_EQ(device.names(), device.both(1));
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
    Device after;
    EXPECT_NE(device.runAgainst(server, true), Outcome::Failed);
    EXPECT_EQ(device.names(), Lines{});
    EXPECT_EQ(arrived.size(), 2U);
    for (const std::string& name : device.names("refused"))
      EXPECT_TRUE(name.ends_with(".plist") || device.names("refused").size() == 2) << name;
  }
}

TEST(Upload, WaitsForANetworkThatMayBeUsed) {
  const std::string head =
      "Iface\tDestination\tGateway\tFlags\tRefCnt\tUse\tMetric\tMask\tMTU\tWindow\tIRTT\n";
  const std::string lan = "eth0\t0000A8C0\t00000000\t0001\t0\t0\t0\t00FFFFFF\t0\t0\t0\n";
  const std::string eth = "eth0\t00000000\t0100A8C0\t0003\t0\t0\t100\t00000000\t0\t0\t0\n";
  const std::string wwan = "wwan0\t00000000\t0100A8C0\t0003\t0\t0\t50\t00000000\t0\t0\t0\n";
  const std::string down = "eth0\t00000000\t0100A8C0\t0002\t0\t0\t1\t00000000\t0\t0\t0\n";
  const std::string zero(32, '0');
  const std::string six = zero + " 00 " + zero + " 00 fe80" + zero.substr(4) +
                          " 00000400 00000001 00000000 00000003 wwan1\n";
  const std::string rejected =
      zero + " 00 " + zero + " 00 " + zero + " ffffffff 00000001 00000000 00200200 lo\n";
  const std::tuple<std::string, std::string, std::string> cases[] = {
      {head + lan + down, rejected, "there is no default route"},
      {head + lan + eth, rejected, ""},
      {head + eth + wwan, rejected, "the network is metered (wwan0)"},
      {head + lan, six, "the network is metered (wwan1)"},
      {"garbage\n\n" + eth.substr(0, 20), "x", "there is no default route"},
  };
  Device device;
  device.add(nameOf(1));
  device.configuration.meteredInterfaces = {"ppp0", "wwan*"};
  for (const auto& [four, sixth, reason] : cases) {
    device.write("/proc/net/route", four);
    device.write("/proc/net/ipv6_route", sixth);
    device.configuration.host = "logs.example.com";
    EXPECT_EQ(upload::reasonToWait(device.root, device.files, device.configuration), reason);
    for (const char* host : {"127.0.0.1", "localhost", "::1"}) {
      device.configuration.host = host;
      EXPECT_EQ(upload::reasonToWait(device.root, device.files, device.configuration), "") << host;
    }
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
  const std::string url = "<key>URL</key><string>";
  const std::string credentials = device.root.path("/credentials");
  const auto run = [&](const std::string& settings) {
    device.write(upload::kConfigurationPath,
                 "<plist version=\"1.0\"><dict>" + settings + "</dict></plist>");
    return upload::readConfiguration(device.root, device.files, device.coding, credentials);
  };
  const std::pair<std::string, std::string> cases[] = {
      {"", "URL is missing: give https://HOST/FOLDER"},
      {url + "http://a/b</string>",
       "URL begins with http: use https, or set AllowPlainHTTP in a laboratory"},
      {url + "ftp://a/b</string>", "URL is not an address: give https://HOST/FOLDER"},
      {url + "https://a /b</string>", "URL is not an address: give https://HOST/FOLDER"},
      {url + "https://u@a/b</string>",
       "URL has more than a host and a path: leave out user, query and fragment"},
      {url + "https://a/b?c</string>",
       "URL has more than a host and a path: leave out user, query and fragment"},
      {"<key>Url</key><string/>", "Url is not a setting: see tavrel-upload(8)"},
      {"<key>StallSeconds</key><integer>0</integer>",
       "StallSeconds is not a time: give an integer from 1 to 86400 seconds"},
      {"<key>RunSeconds</key><real>5</real>",
       "RunSeconds is not a time: give an integer from 1 to 86400 seconds"},
      {"<key>AllowPlainHTTP</key><integer>1</integer>",
       "AllowPlainHTTP is not a boolean: give true or false"},
      {"<key>MeteredInterfaces</key><array><true/></array>",
       "MeteredInterfaces is not an array of names: give strings like wwan*"}};
  for (const auto& [settings, why] : cases) {
    const auto read = run(settings);
    ASSERT_FALSE(read) << settings;
    EXPECT_EQ(read.error().message,
              "cannot use " + device.root.path(upload::kConfigurationPath) + ": " + why);
  }
  const std::string good =
      url + "https://[::1]:8443/a/</string><key>TransferSeconds</key><integer>9</integer>";
  EXPECT_EQ(run(good)->host, "::1");
  EXPECT_EQ(run(good)->url, "https://[::1]:8443/a");
  EXPECT_EQ(run(good)->transfer, std::chrono::seconds(9));
  device.write("/credentials/tavrel-upload.token", "two words\n");
  EXPECT_EQ(run(good).error().message,
            "cannot use the credential tavrel-upload.token: a token has letters, digits and "
            "-._~+/= on one line");
  device.write("/credentials/tavrel-upload.token", "Abc-1==\n");
  EXPECT_EQ(run(good)->token, "Abc-1==");
  device.write("/credentials/tavrel-upload.key", "k");
  EXPECT_EQ(run(good).error().message,
            "cannot use the client certificate: the credential tavrel-upload.certificate is "
            "missing: give both");

  std::string authorization;
  ScriptedServer server([&](const std::string& request) {
    authorization = request.substr(request.find("Authorization"), 30);
    return kOk;
  });
  device.add(nameOf(1));
  device.configuration.token = "Abc-1==";
  EXPECT_EQ(device.runAgainst(server), Outcome::Done);
  EXPECT_EQ(authorization, "Authorization: Bearer Abc-1==\r");
}

TEST(Upload, TellsTheServiceManagerHowItEnded) {
  Device device;
  device.write(upload::kConfigurationPath,
               "<plist "
               "version=\"1.0\"><dict><key>URL</key><string>http://127.0.0.1:1/</"
               "string><key>AllowPlainHTTP</key><true/></dict></plist>");
  const auto run = [&](const std::string& root, const std::string& arguments) {
    const std::string command =
        "TAVREL_ROOT='" + root + "' " TAVREL_UPLOAD " " + arguments + " >/dev/null 2>&1";
    return WEXITSTATUS(std::system(command.c_str()));  // NOLINT(cert-env33-c)
  };
  const std::string root = device.root.path("/");
  EXPECT_EQ(run(root, ""), 0) << "nothing to do";
  device.add(nameOf(1), "pending/");
  EXPECT_EQ(run(root, ""), 75);
  EXPECT_EQ(device.state().failedAttempts, 1);
  EXPECT_EQ(run(root, "--now"), 75);
  EXPECT_EQ(device.state().failedAttempts, 2);
  EXPECT_EQ(run(root, "--then"), 2);
  EXPECT_EQ(run(root, "then"), 2);
  EXPECT_EQ(run(root, "--version"), 0);
  EXPECT_EQ(run(root + "missing", ""), 1);
  fs::remove(device.root.path(upload::kConfigurationPath));
  EXPECT_EQ(run(root, ""), 78);
}

}  // namespace
}  // namespace tavrel
