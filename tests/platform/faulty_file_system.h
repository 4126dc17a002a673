// A file system whose n-th call to the system goes wrong, and what a power cut leaves then.
#pragma once

#include <cstdint>
#include <map>
#include <string>

#include "platform/linux/files/file_system.h"

namespace tavrel {

/// Where no power goes, flushing only costs time.
class QuickFileSystem final : public FileSystem {
 protected:
  int syncFile(int) override { return 0; }
};

class FaultyFileSystem final : public FileSystem {
 public:
  enum class Fault {
    Failure,           // the call fails as on a full disk; the calls after it work
    FailureBeforeCut,  // the same, and at the end the power goes
    Kill,              // the process ends there; what was written stays
    Cut,               // the power goes; names and contents that were not flushed are lost
    CutKeepingNames,   // the same, but the file system had written the names already
  };
  static constexpr Fault kFaults[] = {Fault::Failure, Fault::FailureBeforeCut, Fault::Kill,
                                      Fault::Cut, Fault::CutKeepingNames};

  /// What is below `folder` counts as flushed. Calls are counted from 1.
  FaultyFileSystem(std::string folder, Fault fault, int failingCall);

  /// False when the sequence was over before the failing call.
  bool hasStruck() const { return calls_ >= failingCall_; }
  /// Whether the calls after the failing one work.
  bool goesOn() const { return fault_ <= Fault::FailureBeforeCut; }
  /// Brings the folder into the state in which it is found after the fault.
  void settle();

 protected:
  int openFile(const char* path, int flags, mode_t mode) override;
  ssize_t writeFile(int descriptor, const std::byte* bytes, std::size_t size) override;
  int syncFile(int descriptor) override;
  int truncateFile(int descriptor, off_t size) override;
  int renameFile(const char* from, const char* to) override;
  int removeFile(const char* path) override;
  int makeFolder(const char* path, mode_t mode) override;

 private:
  using Inode = std::uint64_t;

  void flushNames();
  bool strikes();

  std::string folder_;
  Fault fault_;
  int failingCall_;
  int calls_ = 0;
  std::map<Inode, std::string> flushedContents_;
  std::map<std::string, std::map<std::string, Inode>> flushedNames_;  // by folder
};

}  // namespace tavrel
