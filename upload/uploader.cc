#include "upload/uploader.h"

#include <algorithm>
#include <array>
#include <cmath>
#include <cstdint>
#include <cstring>

#include "base/ascii.h"
#include "base/civil_time.h"
#include "base/format.h"
#include "base/instant.h"
#include "base/iso_date.h"
#include "base/limits.h"
#include "platform/linux/files/random.h"
#include "platform/linux/logs/log_day.h"
#include "platform/linux/logs/log_file_name.h"
#include "platform/persisted_state.h"
#include "upload/headers.h"
#include "upload/network.h"
#include "upload/pause.h"

namespace tavrel::upload {
namespace {

constexpr const char* kLockPath = "/var/lib/tavrel/upload/lock";

double chance() {
  std::array<std::byte, sizeof(std::uint32_t)> bytes{};
  fillRandom(bytes);
  std::uint32_t number = 0;
  std::memcpy(&number, bytes.data(), sizeof number);
  return number / 4294967295.0;
}

// Accepts only names that the system itself gives: they are safe in URLs and on the server's disk.
bool isPlain(std::string_view name) {
  return parseLogFileName(name) && std::all_of(name.begin(), name.end(), [](char c) {
           return isLetterOrDigit(c) || c == '-' || c == '_' || c == '.';
         });
}

// Prevents concurrent runs; nothing while another process holds the lock.
Expected<std::optional<Descriptor>> lockRun(const Services& services) {
  return services.files.lockFileIfFree(services.root.path(kLockPath));
}

}  // namespace

Uploader::Uploader(const Services& services, const Configuration& configuration)
    : services_(services),
      configuration_(configuration),
      outbox_(services.root, services.files),
      statePath_(services.root.path(kUploadStateFile)) {}

void noteFailure(const Services& services, std::string_view why) {
  const auto lock = lockRun(services);
  if (!lock) services.log.write(LogLevel::Error, lock.error().message);
  if (!lock || !*lock) return;
  const std::string path = services.root.path(kUploadStateFile);
  UploadState state = readUploadState(services.files, services.propertyLists, services.log, path);
  state.failure = why;
  state.lastFailure = services.clock.now();
  ++state.failedAttempts;
  if (Status written = writeUploadState(services.files, services.propertyLists, path, state);
      !written) {
    services.log.write(LogLevel::Error, written.error().message);
  }
}

Uploader::Permission Uploader::permission() {
  // Reread preferences, because another process may have withdrawn the permission.
  services_.preferences.ZTXPreferencesSynchronize(kDiagnosticsDomain);
  permitted_ = submissionPermission(services_.preferences);
  if (permitted_.isWithdrawn) return Permission::Withdrawn;
  const bool maySend = permitted_.isGiven && !permitted_.isHeldBack();
  return maySend ? Permission::Given : Permission::NotGiven;
}

std::chrono::milliseconds Uploader::timeLeft() const {
  return std::chrono::duration_cast<std::chrono::milliseconds>(
      configuration_.run - (std::chrono::steady_clock::now() - begin_));
}

// A log that cannot be sent fails again each time that all logs are listed.
void Uploader::complain(std::string_view line) {
  if (!complaints_.emplace(line).second) return;
  services_.log.write(LogLevel::Error, line);
  if (complaint_.empty()) complaint_ = line;
}

Outcome Uploader::run(bool atOnce) {
  const auto lock = lockRun(services_);
  if (!lock) {
    complain(lock.error().message);
    return Outcome::Failed;
  }
  if (!*lock) return Outcome::Done;
  Outcome outcome = runLocked(atOnce);
  // Nothing is left to send, so an earlier failure is over. Without a permission, logs may wait.
  const bool isOver =
      outcome == Outcome::Done && !lacksPermission_ && complaint_.empty() && state_.hasFailure();
  if (isOver) succeed();
  if (!complaint_.empty()) {
    state_.failure = complaint_;
    state_.lastFailure = services_.clock.now();
    // Keep `Waits`: the transfer is tried again, whatever else is wrong.
    if (outcome == Outcome::Done) outcome = Outcome::Failed;
  }
  if (failed_ || !complaint_.empty()) ++state_.failedAttempts;
  if (tried_ || isOver || !complaint_.empty()) {
    if (Status written =
            writeUploadState(services_.files, services_.propertyLists, statePath_, state_);
        !written) {
      services_.log.write(LogLevel::Error, written.error().message);
      outcome = Outcome::Failed;
    }
  }
  return outcome;
}

Outcome Uploader::runLocked(bool atOnce) {
  state_ = readUploadState(services_.files, services_.propertyLists, services_.log, statePath_);
  const Permission permitted = permission();
  if (permitted == Permission::Withdrawn) return removeWaiting();
  if (permitted_.isHeldBack()) {
    complain(format("no log is sent: submission is %s", textOf(permitted_)));
  }
  lacksPermission_ = permitted == Permission::NotGiven;
  if (lacksPermission_) return Outcome::Done;
  if (Status taken = outbox_.takePending([this] { return permission() == Permission::Given; });
      !taken) {
    complain(taken.error().message);
  }
  auto logs = outbox_.logs();
  if (!logs) {
    complain(logs.error().message);
    return Outcome::Failed;
  }
  if (logs->empty()) return Outcome::Done;

  const plist::Date now = services_.clock.now();
  if (!atOnce && mustWait(state_, now)) {
    services_.log.log(LogLevel::Info, "logs wait: the next attempt is not before %s",
                      isoDateText(*state_.nextAttempt));
    return Outcome::Waits;
  }
  const auto reason = reasonToWait(services_.root, services_.files, configuration_);
  if (!reason) {
    complain(format("logs wait: %s", reason.error().message));
    return Outcome::Waits;
  }
  if (!reason->empty()) {
    services_.log.log(LogLevel::Info, "logs wait: %s", *reason);
    return Outcome::Waits;
  }

  connection_.emplace(configuration_);
  const Outcome outcome = sendAll(*std::move(logs));
  if (sent_ + refused_ > 0) {
    services_.log.log(LogLevel::Default, "logs sent: %llu, refused by the server: %llu",
                      std::uint64_t{sent_}, std::uint64_t{refused_});
  }
  if (held_ > 0) {
    services_.log.log(LogLevel::Info, "logs of earlier days wait: %llu; submission is %s",
                      std::uint64_t{held_}, textOf(permitted_));
  }
  if (tried_) state_.lastAttempt = now;
  return outcome;
}

Outcome Uploader::sendAll(std::vector<WaitingLog> logs) {
  while (!logs.empty()) {
    const std::size_t before = sent_ + refused_;
    held_ = 0;
    for (const WaitingLog& log : logs) {
      switch (send(log)) {
        case Step::Next:
          break;
        case Step::Held:
          ++held_;
          break;
        case Step::Stop:
          return Outcome::Waits;
        case Step::Broken:
          return Outcome::Failed;
        case Step::Withdrawn:
          return removeWaiting();
        case Step::Misconfigured:
          return Outcome::Misconfigured;
      }
    }
    // List again: logs may have arrived or changed meanwhile. Stop after a pass that sends nothing.
    if (sent_ + refused_ == before) break;
    auto more = outbox_.logs();
    if (!more) {
      complain(more.error().message);
      return Outcome::Failed;
    }
    logs = *std::move(more);
  }
  return Outcome::Done;
}

Uploader::Step Uploader::send(const WaitingLog& log) {
  if (!isPlain(log.name)) {
    complain(format("cannot send %s: it is not named like a log of this system; remove it",
                    percentEncoded(outbox_.logPath(log.name))));
    return Step::Next;
  }
  // Read the log only once, so that the permission is checked for exactly what is sent.
  auto read = readLog(outbox_.logPath(log.name));
  if (!read) {
    complain(read.error().message);
    return Step::Next;
  }
  if (!*read) return Step::Next;
  const std::int64_t day = dayToCover(log, (*read)->content);
  if (const Step asked = askPermission(day); asked != Step::Next) return asked;
  if (timeLeft() <= std::chrono::milliseconds(0)) return stopAtLimit();
  const PackedLog packed = packer_.pack(asBytes((*read)->content), (*read)->stamp);
  read->reset();  // it may be large
  std::vector<std::string> headers = metadataHeaders(metadataOf(log));
  headers.push_back(std::string(kDigestHeader) + ": " + packed.digest);

  // Packing a large log may have taken seconds.
  if (const Step asked = askPermission(day); asked != Step::Next) return asked;
  const std::chrono::milliseconds left = timeLeft();
  if (left <= std::chrono::milliseconds(0)) {
    if (sent_ + refused_ > 0) return stopAtLimit();
    complain(
        format("cannot send log %s: a run ends before it is packed: give RunSeconds of more "
               "than %lld",
               log.name, std::int64_t{configuration_.run.count()}));
    return Step::Stop;
  }
  tried_ = true;
  const auto answer = connection_->put(
      format("%s/%s%s", configuration_.url, log.name, kLogEnding), headers, packed.content,
      std::min<std::chrono::milliseconds>(configuration_.transfer, left),
      [&] { return askPermission(day) == Step::Next; });
  if (answer) return judge(log, *answer, packed);
  if (const Step asked = askPermission(day); asked != Step::Next) return asked;
  if (connection_->isMisconfigured()) {
    complain(format("cannot send logs: %s: correct the credentials of tavrel-upload",
                    answer.error().message));
    return Step::Misconfigured;
  }
  // Only a log for which a whole run is too short has failed.
  if (timeLeft() <= std::chrono::milliseconds(0) && sent_ + refused_ > 0) return stopAtLimit();
  return failToSend(log, answer.error().message);
}

Uploader::Step Uploader::stopAtLimit() {
  services_.log.log(LogLevel::Default, "logs wait: a run takes at most %lld seconds (RunSeconds)",
                    std::int64_t{configuration_.run.count()});
  return Step::Stop;
}

// A log is worth more than its metadata, whose loss keeps none back.
plist::Dictionary Uploader::metadataOf(const WaitingLog& log) {
  const std::string path = outbox_.metadataPath(log.name);
  std::string& fault = metadataFault_;
  fault.clear();
  if (const auto bytes = services_.files.read(path, limits::kPropertyListBytes); !bytes) {
    fault = bytes.error().message;
  } else {
    const auto value = services_.propertyLists.decode(asBytes(*bytes));
    if (value && value->dictionary()) return value->dictionary();
    fault = path + ": " + (value ? "it is not a dictionary" : value.error().message);
  }
  return {};
}

// Like the submission service, judges a log without statistics by the day on which it was made.
std::int64_t Uploader::dayToCover(const WaitingLog& log, std::string_view content) {
  const std::optional<std::int64_t> day = dayOfLog(content, services_.propertyLists);
  return day.value_or(dayOfSecond(log.filed));
}

Uploader::Step Uploader::askPermission(std::int64_t day) {
  switch (permission()) {
    case Permission::Given:
      return permitted_.covers(day) ? Step::Next : Step::Held;
    case Permission::Withdrawn:
      return Step::Withdrawn;
    case Permission::NotGiven:
      break;
  }
  return Step::Stop;
}

Uploader::Step Uploader::judge(const WaitingLog& log, const Answer& answer,
                               const PackedLog& packed) {
  const int status = answer.status;
  if (status == 413 || status == 422) return giveUp(log, status);
  const bool isTaken = status == 200 || status == 201 || status == 204;
  if (isTaken && answer.received == packed.digest) return confirm(log, packed);

  std::string why = format("the server answers %d", status);
  if (isTaken) {
    why += format(
        " without %s and the log's digest: is this the log server, or a portal of the "
        "network?",
        kReceivedHeader);
  } else if (!answer.location.empty()) {
    why += format(
        " and points to %s: redirects are not followed; correct the URL, unless this is a login "
        "page of the network",
        percentEncoded(answer.location.substr(0, 200)));
  } else if (status == 400 || status == 401 || status == 403) {
    why += ": check the certificate and the token";
  } else if (status == 404) {
    why += ": check the URL";
  }
  return failToSend(log, why, answer.retryAfter);
}

Uploader::Step Uploader::confirm(const WaitingLog& log, const PackedLog& packed) {
  const auto stamp = stampOf(outbox_.logPath(log.name));
  if (stamp && *stamp != packed.stamp) {
    complain(format("log %s was changed while it was sent: it is sent again", log.name));
    return Step::Next;
  }
  if (Status removed = outbox_.remove(log.name); !removed) return failToMove(removed.error());
  if (!metadataFault_.empty()) {
    services_.log.log(LogLevel::Error, "log %s was sent without metadata: %s", log.name,
                      metadataFault_);
  }
  ++sent_;
  ++state_.sent;
  state_.lastSuccess = services_.clock.now();
  succeed();
  return Step::Next;
}

Uploader::Step Uploader::giveUp(const WaitingLog& log, int status) {
  services_.log.log(LogLevel::Error, "the server refuses log %s (%d): it is kept in %s/refused",
                    log.name, status, outbox_.folder());
  if (Status moved = outbox_.refuse(log.name, dayOf(services_.clock.now())); !moved)
    return failToMove(moved.error());
  ++refused_;
  ++state_.refused;
  succeed();
  return Step::Next;
}

void Uploader::succeed() {
  state_.nextAttempt.reset();
  state_.failure.clear();
  state_.failedAttempts = 0;
  state_.failedTransfers = 0;
}

Uploader::Step Uploader::failToMove(const Error& error) {
  fail(error.message, 0);
  return Step::Broken;
}

Uploader::Step Uploader::failToSend(const WaitingLog& log, std::string_view why,
                                    std::int64_t serverWish) {
  fail(format("cannot send log %s: %s", log.name, why), serverWish);
  return Step::Stop;
}

void Uploader::fail(std::string line, std::int64_t serverWish) {
  const plist::Date now = services_.clock.now();
  failed_ = true;
  ++state_.failedTransfers;
  state_.lastFailure = now;
  // The state stores whole seconds.
  state_.nextAttempt = plist::Date::sinceEpoch(std::floor(
      now.secondsSinceEpoch() + pauseSeconds(state_.failedTransfers, serverWish, chance())));
  state_.failure = std::move(line);
  services_.log.log(LogLevel::Error, "%s; next attempt after %s", state_.failure,
                    isoDateText(*state_.nextAttempt));
}

Outcome Uploader::removeWaiting() {
  const RemovedLogs removed = outbox_.removeAll();
  if (removed.failure) complain(removed.failure->message);
  if (removed.logs > 0) {
    services_.log.log(LogLevel::Default,
                      "the permission to send logs was withdrawn; waiting logs removed: %llu",
                      std::uint64_t{removed.logs});
  }
  return removed.failure ? Outcome::Failed : Outcome::Done;
}

}  // namespace tavrel::upload
