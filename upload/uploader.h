// One run of the uploader: sends the logs in the outbox, one at a time, oldest first.
//
// A log is removed only once the server has confirmed it, and given up only when the server
// blames the log itself (413, 422). Otherwise it stays; at worst, the server receives it
// again under the same name.
#pragma once

#include <chrono>
#include <cstddef>
#include <optional>
#include <set>
#include <string>
#include <string_view>
#include <vector>

#include "platform/clock.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/logs/submission_permission.h"
#include "platform/linux/runs/upload_state.h"
#include "platform/preferences.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"
#include "upload/configuration.h"
#include "upload/connection.h"
#include "upload/outbox.h"
#include "upload/packed_log.h"

namespace tavrel::upload {

/// The system services that an uploader needs. All of them must outlive it.
struct Services {
  const DeviceRoot& root;
  FileSystem& files;
  PropertyListCoding& propertyLists;
  Preferences& preferences;
  Clock& clock;
  SystemLog& log;
};

/// Records, for `tavrelctl status --check`, why a run could not even begin. Does nothing while
/// another run is active, because that one records its own outcome.
void noteFailure(const Services& services, std::string_view why);

enum class Outcome {
  Done,           // nothing is left to do
  Waits,          // logs are left for a later run
  Failed,         // something is wrong on the device
  Misconfigured,  // no log can be sent until somebody corrects a credential
};

class Uploader {
 public:
  Uploader(const Services& services, const Configuration& configuration);

  /// With `atOnce`, ignores the pause after a failure. Returns quietly if another run is active.
  Outcome run(bool atOnce);

 private:
  enum class Permission { Given, Withdrawn, NotGiven };
  enum class Step { Next, Held, Stop, Broken, Withdrawn, Misconfigured };

  /// Rereads `permitted_`. `NotGiven` also when its first day is not a valid day.
  Permission permission();
  Outcome runLocked(bool atOnce);
  Outcome sendAll(std::vector<WaitingLog> logs);
  Step send(const WaitingLog& log);
  plist::Dictionary metadataOf(const WaitingLog& log);
  /// The day that the permission must cover.
  std::int64_t dayToCover(const WaitingLog& log, std::string_view content);
  /// Whether a log of `day` may be sent now; `Next` when it may.
  Step askPermission(std::int64_t day);
  Step judge(const WaitingLog& log, const Answer& answer, const PackedLog& packed);
  Step confirm(const WaitingLog& log, const PackedLog& packed);
  Step giveUp(const WaitingLog& log, int status);
  Step stopAtLimit();
  Step failToSend(const WaitingLog& log, std::string_view why, std::int64_t serverWish = 0);
  Step failToMove(const Error& error);
  /// Notes the failure and the time of the next attempt.
  void fail(std::string line, std::int64_t serverWish);
  void succeed();
  /// Notes that something on the device itself prevents success.
  void complain(std::string_view line);
  Outcome removeWaiting();
  std::chrono::milliseconds timeLeft() const;

  const Services services_;
  const Configuration& configuration_;
  Outbox outbox_;
  LogPacker packer_;
  std::optional<Connection> connection_;  // made when there is something to send
  const std::string statePath_;
  const std::chrono::steady_clock::time_point begin_ = std::chrono::steady_clock::now();
  UploadState state_;
  SubmissionPermission permitted_;  // when last read
  std::size_t sent_ = 0;
  std::size_t refused_ = 0;
  std::size_t held_ = 0;  // in the last pass, because the permission does not cover their day
  bool lacksPermission_ = false;  // from the start; logs may wait
  std::string metadataFault_;     // of the log that is sent; empty without one
  bool tried_ = false;
  bool failed_ = false;    // a transfer
  std::string complaint_;  // the first of this run
  std::set<std::string> complaints_;
};

}  // namespace tavrel::upload
