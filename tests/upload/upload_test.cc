#include <regex>
#include <zlib.h>

#include "base/limits.h"
#include "device.h"
#include "platform/linux/files/random.h"
#include "tests/helpers/killed_process.h"

namespace tavrel {
namespace {

std::string gunzipped(const std::string& path) {
  const std::unique_ptr<gzFile_s, int (*)(gzFile)> file(gzopen(path.c_str(), "rb"), gzclose);
  char text[4096];
  return {text, static_cast<std::size_t>(std::max(0, gzread(file.get(), text, sizeof text)))};
}

const char* const kOfTheDayBefore =
    "<plist version=\"1.0\"><dict><key>BHStartDate</key>"
    "<date>2026-11-26T00:00:00Z</date></dict></plist>";

TEST(Upload, SendsAllToNginxOldestFirst) {
  Nginx nginx;
  Device device;
  const std::string server = format("https://127.0.0.1:%d/logs", nginx.port);
  for (const int number : {61, 3, 7})
    device.add(nameOf(number));
  const std::string kOther = "StorageStatus-20261127T180106Z-5f0c9a1e";
  device.add(kOther);
  device.add(nameOf(5), "pending/", "4\r\nEvil: 1 \xC3\xA9 100%");
  device.write(kOutbox + nameOf(9) + ".metadata.plist", "its log is gone");
  const std::tuple<std::string, const char*, const char*, std::string> faults[] = {
      {server, "ca", "",
       nameOf(3) + ": the server answers 400: check the certificate and the token; next attempt"},
      {server, "ca", "other", "the server answers 400"},
      {server, "ca", "forged", "the server answers 400"},
      {server, "other", "device",
       ": check the URL, the clock, and tavrel-upload.authority in CREDENTIALS_DIRECTORY; next"},
      {format("https://localhost:%d/logs", nginx.port), "ca", "device",
       "no alternative certificate subject name matches"},
      {server + "s", "ca", "device", "the server answers 404: check the URL"}};
  for (const auto& [url, authority, certificate, why] : faults) {
    device.use(url, nginx.folder, authority, certificate);
    EXPECT_EQ(device.run(true), Outcome::Waits);
    EXPECT_NE(device.log.lines.back().find(why), std::string::npos) << device.log.lines.back();
  }
  device.use(server, nginx.folder, "ca", "device");
  device.configuration.key = nginx.folder + "other.key";
  EXPECT_EQ(device.run(true), Outcome::Misconfigured);
  EXPECT_TRUE(device.log.lines.back().ends_with(": correct the credentials of tavrel-upload"));
  EXPECT_EQ(std::tuple(device.state().failedAttempts, device.state().failedTransfers),
            std::tuple(7, 6));
  EXPECT_EQ(device.names().size(), 10U);

  device.use(server, nginx.folder, "ca", "device");
  EXPECT_EQ(device.run(true), Outcome::Done);
  EXPECT_EQ(device.log.lines.back(), "logs sent: 5, refused by the server: 0");
  device.add(nameOf(7));  // as if the answer had been lost
  EXPECT_EQ(device.run(), Outcome::Done);
  EXPECT_EQ(device.names(), Lines{});
  std::string expected;
  for (const std::string& name : {nameOf(3), nameOf(5), nameOf(7), nameOf(61), kOther, nameOf(7)}) {
    EXPECT_EQ(gunzipped(nginx.folder + "srv/device-7/" + name + ".log.gz"), "content of " + name);
    const bool isRepeat = name == nameOf(7) && expected.find(name) != name.npos;
    expected += format(
        R"({"device":"device-7","log":"%s.log","status":%d,"type":"193","name":"log-tallied",)"
        R"("os_version":"%s","filed":"2026-11-27T18:02:18Z","options":"a%%26b=x y&c=7"})",
        name, isRepeat ? 204 : 201,
        name == nameOf(5) ? "4%0D%0AEvil: 1 %C3%A9 100%25" : "Pellio 4.2 (16R349)");
  }
  EXPECT_EQ(std::regex_replace(nginx.accessLog(), std::regex("\"time\":\"[^\"]*\",|\n"), ""),
            expected);
  const UploadState state = device.state();
  EXPECT_EQ(std::tuple(state.sent, state.refused, state.failedAttempts, state.failure),
            std::tuple(6, 0, 0, ""));
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
  // The answer, the message about it, and the shortest and longest pause.
  const std::tuple<std::string, std::string, double, double> cases[] = {
      {"200 OK\r\nContent-Length: 5\r\n\r\nhello", ends + "200" + portal, 300, 600},
      {"201 Created\r\nTavrel-Received: sha-256=:bw==:\r\n", ends + "201" + portal, 300, 600},
      {"202 Accepted\r\n" + received, ends + "202", 300, 600},
      {"302 Found\r\nLocation: http://portal.example/\r\n",
       ends + "302 and points to http://portal.example/: redirects are not followed; correct the "
              "URL, unless this is a login page of the network",
       300, 600},
      {"401 No\r\n", ends + "401: check the certificate and the token", 300, 600},
      {"403 No\r\n", ends + "403: check the certificate and the token", 300, 600},
      {busy + "7200\r\n", ends + "503", 7200, 7920},
      {busy + "Fri, 31 Dec 9999 23:59:59 GMT\r\n", ends + "503", 21'599, 86'400},
      {busy + "99999999999999999999\r\n", ends + "503", 300, 86'400},
      {"201 Created\r\n" + received + "Content-Length: 9\r\n\r\ncut",
       "transfer closed with 6 bytes remaining to read", 300, 600},
      {"202 Accepted\r\n" + received + "\r\n" + std::string(limits::kUploadAnswerBytes, 'x'),
       ends + "202", 300, 600},
      {"201 Created\r\n" + received + "\r\n" + std::string(limits::kUploadAnswerBytes + 1, 'x'),
       "the answer is too long", 300, 600},
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
    const UploadState state = device.state();
    EXPECT_EQ(state.failure, "cannot send log " + nameOf(1) + ": " + why);
    EXPECT_EQ(state.failedAttempts, 1);
    const double wait = state.nextAttempt.value_or(device.clock.time) - device.clock.time;
    EXPECT_GE(wait, shortest - 1);  // the state has only whole seconds
    EXPECT_LE(wait, longest);
    const int connections = server.connections;
    EXPECT_EQ(device.run(), Outcome::Waits);
    EXPECT_EQ(server.connections, connections) << "not before its time";
    device.clock.time = plist::Date::since1970(0);
    EXPECT_EQ(device.run(), Outcome::Waits);
    EXPECT_GT(server.connections, connections) << "another clock";
    device.permit("<string>yes</string>");
    EXPECT_EQ(device.run(), Outcome::Done);
    EXPECT_TRUE(device.state().nextAttempt) << "logs wait, but may not be sent";
    device.permit("<false/>");
    EXPECT_EQ(device.run(), Outcome::Done);
    EXPECT_FALSE(device.state().hasFailure()) << "nothing waits";
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

// When a handle is reused, libcurl 7.88 takes the line as part of a header that it has freed.
TEST(Upload, AFoldedLineBelongsToNoEarlierAnswer) {
  Device device;
  device.add(nameOf(1));
  device.add(nameOf(2));
  int requests = 0;
  ScriptedServer server([&](const std::string&) {
    return ++requests == 1 ? kOk
                           : "HTTP/1.1 201 Created\r\n folded: x\r\nContent-Length: 0\r\n\r\n";
  });
  EXPECT_EQ(device.runAgainst(server), Outcome::Waits);
  EXPECT_EQ(requests, 2);
  EXPECT_EQ(device.state().sent, 1);
  EXPECT_EQ(device.names(), (Lines{nameOf(2) + ".log", nameOf(2) + ".metadata.plist"}));
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
  // Only a few fit in 4 MiB besides the large one; metadata stays with each.
  EXPECT_EQ(device.names("refused").size(), 1 + 2 * 10);
  device.add(nameOf(40));
  fs::remove(device.root.path(kSubmission + "refused/" + nameOf(30) + ".log"));
  for (int number = 41; number < 60; ++number)
    device.add(nameOf(number));
  EXPECT_EQ(device.run(), Outcome::Done);
  EXPECT_EQ(device.names("refused").size(), 2 * 16U);
  EXPECT_EQ(device.names("refused")[0], nameOf(44) + ".log");
  // A log that is held back does not keep the run going.
  device.permit("<true/>", "<integer>20784</integer>");
  device.add(nameOf(60));
  device.add(nameOf(61));
  device.write(kOutbox + nameOf(61) + ".log", kOfTheDayBefore);
  device.configuration.run = std::chrono::seconds(3);
  EXPECT_EQ(device.run(), Outcome::Done);
  EXPECT_EQ(device.names().size(), 2U);
}

TEST(Upload, KeepsARefusedLogBesideThoseOfAClockThatWasAhead) {
  Device device;
  for (int second = 10; second < 26; ++second)
    device.add(format("log-tallied-20370101T0000%dZ-5f0c9a1e", second), "refused/");
  device.add(nameOf(1));
  device.write(kOutbox + nameOf(1) + ".log", std::string(5 << 20, 'x'));  // displaces no others
  const ScriptedServer server([](const std::string&) { return status("422 Unfit"); });
  EXPECT_EQ(device.runAgainst(server), Outcome::Done);
  const Lines names = device.names("refused");
  ASSERT_EQ(names.size(), 2 * 16U);
  EXPECT_EQ(names[0], nameOf(1) + ".log");
  EXPECT_EQ(names[2], "log-tallied-20370101T000011Z-5f0c9a1e.log");
  device.add(nameOf(2));
  EXPECT_EQ(device.runAgainst(server), Outcome::Done);
  EXPECT_EQ(device.names("refused").size(), 2 * 16U) << "the large log left its place to another";
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
  Device obstructed;
  obstructed.permit("<false/>");
  obstructed.write(kSubmission + "pending", "");
  obstructed.add(nameOf(1));
  obstructed.write(kOutbox + nameOf(2) + ".log/file", "in a folder, which is no log");
  EXPECT_EQ(obstructed.run(), Outcome::Failed);
  EXPECT_EQ(obstructed.names(), Lines{nameOf(2) + ".log"});
  EXPECT_EQ(
      obstructed.log.lines,
      (Lines{"cannot list " + obstructed.root.path(kSubmission + "pending") + ": Not a directory",
             "the permission to send logs was withdrawn; waiting logs removed: 1"}));
  const std::tuple<const char*, const char*, std::size_t, std::string> changes[] = {
      {"<false/>", "", 0, "the permission to send logs was withdrawn; waiting logs removed: 1"},
      {"<true/>", "<integer>20785</integer>", 2,
       "logs of earlier days wait: 1; submission is allowed from day 20785 (2026-11-28) on"}};
  for (const auto& [value, firstDay, left, line] : changes) {
    Device device;
    device.add(nameOf(1));
    ScriptedServer server([&, value = value, firstDay = firstDay](const std::string&) {
      device.permit(value, firstDay);
      return "HTTP/1.1 100 Continue\r\n\r\n";  // nothing more
    });
    const auto begin = std::chrono::steady_clock::now();
    EXPECT_EQ(device.runAgainst(server), Outcome::Done);
    EXPECT_EQ(device.names().size(), left);
    EXPECT_EQ(device.log.lines, Lines{line});
    EXPECT_LT(std::chrono::steady_clock::now() - begin, device.configuration.stall);
  }
}

TEST(Upload, JudgesEachLogByItsDay) {
  const std::string kNand = "StorageStatus-20261127T180106Z-5f0c9a1e";
  const std::string wait = "logs of earlier days wait: ";
  const std::string none =
      "no log is sent: submission is held back: DiagnosticSubmissionFirstDay is not a day: run "
      "'tavrelctl allow'";
  // The first day, the logs that are sent, and the last line.
  const std::tuple<const char*, std::set<std::string>, std::string> cases[] = {
      {"<integer>20783</integer>", {nameOf(1), kNand}, "logs sent: 2, refused by the server: 0"},
      {"<integer>20784</integer>",
       {kNand},
       wait + "1; submission is allowed from day 20784 (2026-11-27) on"},
      {"<integer>20785</integer>",
       {},
       wait + "2; submission is allowed from day 20785 (2026-11-28) on"},
      {"<real>1.5</real>", {}, none},
      {"<string>20783</string>", {}, none}};
  for (const auto& [firstDay, expected, line] : cases) {
    SCOPED_TRACE(firstDay);
    Device device;
    device.permit("<true/>", firstDay);
    device.add(kNand);  // does not belong to a day
    device.add(nameOf(1));
    device.write(kOutbox + nameOf(1) + ".log", kOfTheDayBefore);
    std::set<std::string> sent;
    ScriptedServer server([&](const std::string& request) {
      EXPECT_NE(request.find("\r\nContent-Type: application/octet-stream\r\n"), request.npos);
      sent.insert(request.substr(10, request.find(".log ") - 10));  // "PUT /logs/"
      return kOk;
    });
    EXPECT_EQ(device.runAgainst(server), line == none ? Outcome::Failed : Outcome::Done);
    EXPECT_EQ(sent, expected);
    EXPECT_EQ(device.names().size(), 4 - 2 * sent.size());
    EXPECT_EQ(device.log.lines.back(), line);
  }
}

// The file cannot be removed.
struct WatchedFiles final : MeddlingFiles {
  int removeFile(const char* path) override {
    if (path != part) return FileSystem::removeFile(path);
    errno = EIO;
    return -1;
  }
};

TEST(Upload, SendsWhatThePermissionIsAskedFor) {
  Device device;
  device.permit("<true/>", "<integer>20784</integer>");
  device.write(kOutbox + nameOf(1) + ".log", kOfTheDayBefore);
  WatchedFiles files;
  files.part = device.root.path(kOutbox + nameOf(1) + ".log");
  files.meddle = [&] { device.add(nameOf(1)); };
  int requests = 0;
  ScriptedServer server([&](const std::string&) {
    ++requests;
    return kOk;
  });
  EXPECT_EQ(device.runAgainst(server, false, &files), Outcome::Done);
  EXPECT_EQ(requests, 0) << "the log of a day that is not permitted, which another replaced";
  EXPECT_TRUE(device.log.says("logs of earlier days wait: 1"));
}

TEST(Upload, MakesNoAttemptWhenPackingTakesTheTimeOfARun) {
  const std::string cannotSend = "cannot send log " + nameOf(1) +
                                 ": a run ends before it is packed: give RunSeconds of more than 0";
  const std::tuple<int, Lines, std::string> cases[] = {
      {1, {cannotSend}, cannotSend},
      {2,
       {"logs wait: a run takes at most 0 seconds (RunSeconds)",
        "logs sent: 1, refused by the server: 0"},
       ""}};
  for (const auto& [number, lines, failure] : cases) {
    Device device;
    device.add(nameOf(1));
    device.add(nameOf(2));
    WatchedFiles files;
    files.part = device.root.path(kOutbox + nameOf(number) + ".metadata.plist");
    files.meddle = [&] { device.configuration.run = std::chrono::seconds(0); };
    EXPECT_EQ(
        device.runAgainst(ScriptedServer([](const std::string&) { return kOk; }), false, &files),
        Outcome::Waits);
    EXPECT_EQ(device.log.lines, lines);
    const UploadState state = device.state();
    EXPECT_EQ(std::tuple(state.failure, state.failedTransfers, state.sent),
              std::tuple(failure, 0, number - 1));
    EXPECT_EQ(state.lastAttempt.has_value(), number == 2);
  }
}

TEST(Upload, SaysWhatItCannotReadAndSendsTheRest) {
  Device device;
  device.add(nameOf(2));
  const std::string metadata = kOutbox + nameOf(2) + ".metadata.plist";
  device.write(metadata, "damaged");
  const std::string pending = device.root.path(kSubmission + "pending");
  const std::string noLog = device.root.path(kOutbox + nameOf(1) + ".log");
  device.write(kSubmission + "pending", "");
  ASSERT_EQ(mkfifo(noLog.c_str(), 0600), 0);
  EXPECT_EQ(device.runAgainst(ScriptedServer([](const std::string&) { return kOk; })),
            Outcome::Failed);
  EXPECT_EQ(
      device.log.lines,
      (Lines{"cannot list " + pending + ": Not a directory",
             "cannot read " + noLog + ": not a regular file",
             "log " + nameOf(2) + " was sent without metadata: " + device.root.path(metadata) +
                 ": not a property list: it begins neither with "
                 "\"bplist00\" nor with \"<\"",
             "logs sent: 1, refused by the server: 0"}));
}

TEST(Upload, EndsWithOneLineWhenALogCannotBeRemoved) {
  Device device;
  device.add(nameOf(1));
  device.add(nameOf(2));
  WatchedFiles files;
  files.part = device.root.path(kOutbox + nameOf(1) + ".log");
  EXPECT_EQ(
      device.runAgainst(ScriptedServer([](const std::string&) { return kOk; }), false, &files),
      Outcome::Failed);
  const std::string line = "cannot remove " + files.part + ": Input/output error";
  ASSERT_EQ(device.log.lines.size(), 1U);
  EXPECT_TRUE(device.log.lines[0].starts_with(line + "; next attempt after 2026-11-27T18:"));
  EXPECT_EQ(device.state().failure, line);
  EXPECT_EQ(std::tuple(device.state().failedAttempts, device.state().sent), std::tuple(1, 0));
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
  EXPECT_TRUE(
      device.log.says("other name.log: it is not named like a log of this system; remove it"));
  EXPECT_EQ(device.names(), Lines{"other name.log"}) << "the changed one was sent by another pass";
  EXPECT_EQ(requests, 5);

  const Descriptor lock = device.lockRuns();
  ASSERT_EQ(fchmod(lock.get(), 0644), 0);
  device.add(nameOf(1));
  device.log.lines.clear();
  EXPECT_EQ(device.run(), Outcome::Done) << "while another uploader is at work";
  EXPECT_EQ(FileSystem::status(device.root.path("/var/lib/tavrel/upload/lock"))->st_mode,
            S_IFREG | 0600)
      << "nobody else can lock it";
  EXPECT_EQ(device.log.lines, Lines{});
  EXPECT_EQ(requests, 5);
}

TEST(Upload, LosesNothingWhenItIsKilled) {
  std::set<std::string> arrived;
  const auto reply = [&](const std::string& request) {
    const std::size_t at = request.find("log-tallied-");
    arrived.insert(request.substr(at, nameOf(1).size()));
    return arrived.size() == 2 ? status("422 Unfit") : kOk;
  };
  bool isKilled = true;
  int kills = 0;
  for (std::size_t calls = 40; isKilled; ++calls) {
    SCOPED_TRACE(calls);
    Device device;
    arrived.clear();
    device.add(nameOf(1), "pending/");
    device.add(nameOf(2));
    {
      ScriptedServer server(reply);
      server.settle();
      isKilled = runUntilSystemCall(calls, [&] { device.runAgainst(server); });
      kills += isKilled;
    }
    std::set<std::string> kept = arrived;
    for (const std::string place : {"pending", "outbox", "refused"}) {
      const Lines names = device.names(place);
      for (std::size_t i = 0; i < names.size(); ++i) {
        if (!names[i].ends_with(".log")) continue;
        kept.insert(names[i].substr(0, nameOf(1).size()));
        EXPECT_TRUE(i + 1 < names.size() && names[i + 1].ends_with(".plist")) << place;
      }
    }
    EXPECT_EQ(kept.size(), 2U);
    EXPECT_NE(device.runAgainst(ScriptedServer(reply), true), Outcome::Failed);
    EXPECT_EQ(device.names(), Lines{});
    EXPECT_EQ(arrived.size(), 2U);
  }
  EXPECT_GT(kills, 100);
}

}  // namespace
}  // namespace tavrel
