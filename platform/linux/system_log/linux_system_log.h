// The system log: the journal, or standard error without one.
//
// Under the service manager standard error is connected to the journal, and JOURNAL_STREAM
// identifies that stream. Entries then go to the journal's own socket, so that an entry of several
// lines stays one entry and is not mixed with what is printed on standard error. Otherwise each
// entry is written on standard error at once, as "TIME LEVEL message", further lines indented.
// Control characters other than line ends are escaped.
//
// A message above debug level that is longer than `kLongestMessage` is cut there, with a note of
// how much is missing, and follows whole at debug level.
//
// Every level is written; the journal decides what to keep and show.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>

#include "platform/linux/files/descriptor.h"
#include "platform/system_log.h"

namespace tavrel {

class LinuxSystemLog final : public SystemLog {
 public:
  static constexpr const char* kJournalSocket = "/run/systemd/journal/socket";

  /// `errorStream` is borrowed.
  explicit LinuxSystemLog(int errorStream = 2, std::string journalSocket = kJournalSocket);

  void write(LogLevel level, std::string_view message) override;

  /// Whether standard error is connected to the journal.
  bool isJournal();

  /// In bytes, without the note about what was cut.
  static constexpr std::size_t kLongestMessage = 8192;

 private:
  enum class Way { Undecided, Journal, Stream };

  void decideWay();
  void writeWhole(LogLevel level, std::string_view message);
  bool isStreamTheJournal() const;
  bool connectToJournal();
  bool sendToJournal(LogLevel level, std::string_view message);
  void writeToStream(LogLevel level, std::string_view message) const;

  int errorStream_;
  std::string journalPath_;
  Descriptor journal_;
  Way way_ = Way::Undecided;
  bool streamIsJournal_ = false;
};

}  // namespace tavrel
