#include <dlfcn.h>
#include <netdb.h>

#include "device.h"
#include "upload/connection.h"
#include "upload/network.h"
#include "upload/pause.h"

// Replaces the C library's function: the look-up of one name never ends.
extern "C" int getaddrinfo(const char* node, const char* service, const addrinfo* hints,
                           addrinfo** result) {
  if (node != nullptr && std::string_view(node) == "hangs.example") pause();
  using Original = decltype(&getaddrinfo);
  static const auto kOriginal = reinterpret_cast<Original>(dlsym(RTLD_NEXT, "getaddrinfo"));
  return kOriginal(node, service, hints, result);
}

namespace tavrel {
namespace {

TEST(Upload, HasADeadlineForEverything) {
  using std::chrono::seconds;
  Device device;
  device.add(nameOf(1));
  device.configuration.stall = seconds(1);
  ScriptedServer silent([](const std::string&) { return "H"; });
  EXPECT_EQ(device.runAgainst(silent), Outcome::Waits);
  EXPECT_TRUE(device.log.says("Operation too slow. Less than 100 bytes/sec transferred the last "));
  upload::Connection connection(device.configuration);
  const auto put = [&](const std::string& url, int milliseconds) {
    return connection.put(url, {}, "", std::chrono::milliseconds(milliseconds),
                          [] { return true; });
  };
  for (const int milliseconds : {0, -1})
    EXPECT_EQ(put(silent.url(), milliseconds).error().message, "no time is left");
  const std::string tooLong(8'100'000, 'x');  // libcurl refuses it
  EXPECT_THROW(static_cast<void>(put(tooLong, 1000)), std::runtime_error);
  device.configuration.stall = seconds(60);
  for (auto* const limit : {&device.configuration.transfer, &device.configuration.run}) {
    *limit = seconds(1);
    device.log.lines.clear();
    EXPECT_EQ(device.run(true), Outcome::Waits);
    EXPECT_TRUE(device.log.says("Operation timed out after "));
    *limit = seconds(600);
  }
  device.add(nameOf(2));
  int requests = 0;
  const auto slowly = [&](const std::string&) { return ++requests == 1 ? kOk : "H"; };
  device.configuration.run = seconds(1);
  device.log.lines.clear();
  EXPECT_EQ(device.runAgainst(ScriptedServer(slowly), true), Outcome::Waits);
  EXPECT_EQ(device.log.lines, (Lines{"logs wait: a run takes at most 1 seconds (RunSeconds)",
                                     "logs sent: 1, refused by the server: 0"}));
  EXPECT_EQ(device.state().failedTransfers, 0) << "a run that sent something ends at its limit";
  device.configuration.run = seconds(0);
  EXPECT_EQ(device.run(true), Outcome::Waits);
  EXPECT_EQ(device.log.lines.back(), "logs wait: a run takes at most 0 seconds (RunSeconds)");
  device.configuration.run = seconds(600);
  device.configuration.url = "http://hangs.example/logs";
  device.configuration.connect = seconds(1);
  silent.settle();
  // In a separate process, because the look-up never ends.
  EXPECT_EQ(inChild([&] {
              alarm(60);
              return device.run(true) == Outcome::Waits &&
                             device.log.says("Resolving timed out after ")
                         ? 0
                         : 1;
            }),
            0);
  EXPECT_EQ(device.names().size(), 2U);
}

struct NoTables final : FileSystem {
  int openFile(const char* path, int flags, mode_t mode) override {
    if (!std::string_view(path).ends_with("route")) return FileSystem::openFile(path, flags, mode);
    errno = ENOENT;
    return -1;
  }
};

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
  const std::string half = zero + " 01 " + row6("1 1 0 00000003 eth0").substr(zero.size() + 4);
  const std::tuple<std::string, std::string, std::string> cases[] = {
      {head + lan + down, rejected + half, "there is no default route"},
      {head + lan + down + eth, rejected, ""},
      {head + eth + row("wwan0", "00000000", "0003", 50), "", "the network is metered (wwan0)"},
      {head + eth + row("wwan0", "00000000", "0003", 700), "", ""},
      {head, row6("00000400 1 0 00000003 eth0") + row6("000000ff 1 0 00000003 wwan1"),
       "the network is metered (wwan1)"},
      {"garbage\n\n" + eth.substr(0, 20), "x", "there is no default route"}};
  Device device;
  device.add(nameOf(1));
  device.configuration.meteredInterfaces = {"ppp0", "wwan*"};
  const auto reason = [&](const char* host) {
    device.configuration.host = host;
    return *upload::reasonToWait(device.root, device.files, device.configuration);
  };
  for (const auto& [four, six, expected] : cases) {
    device.write("/proc/self/net/route", four);
    device.write("/proc/self/net/ipv6_route", six);
    EXPECT_EQ(reason("logs.example.com"), expected);
    for (const char* host : {"127.0.0.1", "localhost", "::1"})
      EXPECT_EQ(reason(host), "") << host;
  }
  device.configuration.host = "127.evil.example";
  EXPECT_EQ(device.run(), Outcome::Waits);
  EXPECT_EQ(device.log.lines, Lines{"logs wait: there is no default route"});
  EXPECT_FALSE(fs::exists(device.root.path(kUploadStateFile)));
  NoTables noTables;
  EXPECT_EQ(device.run(false, &noTables), Outcome::Waits);
  EXPECT_EQ(device.state().failure,
            "logs wait: cannot find a route: neither /proc/self/net/route nor "
            "/proc/self/net/ipv6_route exists; mount /proc");
  device.configuration.needsDefaultRoute = false;
  EXPECT_EQ(reason("logs.example.com"), "");
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
      {"<key>URL</key><integer>1</integer>", noUrl},
      {url + "https://a /b</string>", noUrl},
      {url + "https://u@a/b</string>", more},
      {url + "https://a/b?c</string>", more},
      {url + "https://a/b#</string>", more},
      {"<key>Url</key><string/>", "Url is not a setting: see tavrel-upload(8)"},
      {"<key>StallSeconds</key><integer>0</integer>", "StallSeconds" + noTime},
      {"<key>RunSeconds</key><real>5</real>", "RunSeconds" + noTime},
      {"<key>RunSeconds</key><integer>86401</integer>", "RunSeconds" + noTime},
      {"<key>AllowPlainHTTP</key><integer>1</integer>",
       "AllowPlainHTTP is not a boolean: give true or false"},
      {"<key>MeteredInterfaces</key><array><true/></array>",
       "MeteredInterfaces is not an array of names: give strings like wwan*"}};
  for (const auto& [settings, why] : cases)
    EXPECT_EQ(configured(settings).error().message, "cannot use " + at + ": " + why) << settings;
  const std::string good = url + "https://[::1]:8443/a/</string>";
  device.configure(good);
  fs::permissions(at, fs::perms(0646));
  EXPECT_EQ(configured(good).error().message,
            "cannot use " + at +
                ": users other than root may write it: make root its owner and set mode 0644");
  fs::permissions(at, fs::perms(0644));
  EXPECT_EQ(configured(good)->host, "::1");
  EXPECT_EQ(configured(good)->url, "https://[::1]:8443/a");
  const auto set = configured(
      "<key>URL</key><string>https://LOCALHOST/a</string><key>NeedsDefaultRoute</key><false/>"
      "<key>ConnectSeconds</key><integer>1</integer><key>StallSeconds</key><integer>2</integer>"
      "<key>TransferSeconds</key><integer>3</integer><key>RunSeconds</key><integer>86400</integer>"
      "<key>MeteredInterfaces</key><array><string>wwan*</string></array>");
  ASSERT_TRUE(set);
  EXPECT_EQ(std::tuple(set->host, set->connect.count(), set->stall.count(), set->transfer.count(),
                       set->run.count(), set->needsDefaultRoute, set->meteredInterfaces),
            std::tuple("localhost", 1, 2, 3, 86'400, false, Lines{"wwan*"}));
  EXPECT_FALSE(set->mayBePlain);
  device.configure(good);
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
  std::string encoding;
  ScriptedServer server([&](const std::string& request) {
    authorization = ScriptedServer::valueOf(request, "Authorization");
    encoding = ScriptedServer::valueOf(request, "Content-Encoding");
    return kOk;
  });
  device.add(nameOf(1));
  EXPECT_EQ(device.runAgainst(server), Outcome::Done);
  EXPECT_EQ(authorization, "Bearer Abc-1==");
  EXPECT_EQ(encoding, "gzip");
}

TEST(Upload, TellsTheServiceManagerHowItEnded) {
  Device device;
  device.configure(
      "<key>URL</key><string>http://127.0.0.1:1/</string><key>AllowPlainHTTP</key><true/>");
  const auto run = [&](const std::string& arguments, const std::string& below = "/") {
    const std::string command = "TAVREL_ROOT=" + device.root.path(below) + " " TAVREL_UPLOAD " " +
                                arguments + " >" + device.root.path("/said") + " 2>&1";
    return WEXITSTATUS(std::system(command.c_str()));  // NOLINT(cert-env33-c)
  };
  EXPECT_EQ(run(""), 0) << "nothing to do";
  device.add(nameOf(1), "pending/");
  device.write(kOutbox + "log tallied-20261127T180000Z-5f0c9a1e.log", "not ours");
  for (const char* arguments : {"", "--now", ""})
    EXPECT_EQ(run(arguments), 75) << "what cannot be sent does not end the attempts";
  EXPECT_TRUE(
      device.state().failure.ends_with(": it is not named like a log of this system; "
                                       "remove it"));
  for (const std::string argument : {"--then", "--now=1", "then"}) {
    EXPECT_EQ(run(argument), 2);
    EXPECT_EQ(contentOf(device.root.path("/said")),
              "tavrel-upload: unexpected argument '" + argument + "': see --help\n");
  }
  EXPECT_EQ(run("--version"), 0);
  EXPECT_EQ(run("", "/missing"), 1);
  device.configure("");
  EXPECT_EQ(run(""), 78);
  const std::string path = device.root.path(upload::kConfigurationPath);
  EXPECT_TRUE(
      contentOf(device.root.path("/said"))
          .ends_with(" error cannot use " + path + ": URL is missing: give https://HOST/FOLDER\n"));
  EXPECT_EQ(std::tuple(device.state().failedAttempts, device.state().failedTransfers),
            std::tuple(3, 2));
  const auto lock = device.lockRuns();
  EXPECT_EQ(run(""), 78);
  EXPECT_EQ(device.state().failedAttempts, 3) << "another run writes the state when it ends";
}

}  // namespace
}  // namespace tavrel
