// The queue of ECC events that "kern.next_ecc_event" reads, as files in /var/lib/tavrel/ecc-events
// under the device root.
//
// "NAME.event" holds one event of 72 bytes: the event's identifier and its count of registers (a
// byte each), 6 ignored bytes, and 8 registers of 64 bits in little-endian order. "NAME.errno"
// holds the decimal number of an error with which one read fails. Files are taken in the order of
// their names. Files with other names are left alone.
//
// An event is removed once `filed` says that its record is safe, an error as soon as it is read. A
// run of reads ends with the first that fails. It gives ten events at most, and none after an event
// that was not filed: the next read fails with EBUSY and removes nothing. The folder is locked from
// a run's first event to its end, and while events are published, so that no other process hands
// out or publishes the same ones.
//
// New errors that the kernel has counted (EDAC) since the last look are published into the queue:
// identifier 1 for corrected and 2 for uncorrected errors, with three registers: the number of the
// memory controller, its new errors, and all its errors since boot.
// /var/lib/tavrel/edac-counters.plist remembers the counts and the boot in which they were seen,
// because the kernel counts from 0 again in each boot.
#pragma once

#include <cstddef>
#include <string>
#include <string_view>
#include <vector>

#include "base/plist.h"
#include "platform/linux/files/descriptor.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/property_list_coding.h"
#include "platform/system_controls.h"
#include "platform/system_log.h"

namespace tavrel {

inline constexpr std::string_view kEccEventFolder = "/var/lib/tavrel/ecc-events";

inline constexpr std::size_t kEccEventBytes = 72;

/// The most events that one run of reads hands out.
inline constexpr int kEccEventsOfARun = 10;

class EccEvents {
 public:
  /// `Peek` yields the same events without removing or publishing any.
  enum class Mode { Consume, Peek };

  EccEvents(const DeviceRoot& root, FileSystem& files, PropertyListCoding& propertyLists,
            SystemLog& log, Mode mode)
      : root_(root), files_(files), propertyLists_(propertyLists), log_(log), mode_(mode) {}

  /// Hands the next event out. ENOENT when there is none, EBUSY when it has to wait for another
  /// run, ENOMEM when it does not fit. `buffer` keeps its content on failure.
  SystemControls::Result next(MutableByteSpan buffer);

  /// Removes the event that was handed out last: its record is on storage.
  void filed();

 private:
  struct Event {
    std::string name;   // of its file
    std::string bytes;  // empty when they are in the file
  };

  SystemControls::Result endRun(int errorNumber);
  /// Locks the folder for the rest of the run; false, and a line, when that fails.
  bool lockQueue();
  /// False when the queue cannot be locked to publish new errors.
  bool fill();
  /// Renames an unusable file out of the way; when peeking, only logs that it would.
  void setAside(const std::string& path, std::string_view fault);
  /// The counts at the last look; for a controller that is gone, the last known ones.
  plist::Dictionary seenErrors();
  /// Writes events for the errors counted since the last look, and remembers the counts. Writes no
  /// event when the counts cannot be stored.
  bool publishCountedErrors();
  Status publish(const std::vector<Event>& events, const plist::Dictionary& counted);
  /// The events for errors beyond `counted`, which is updated.
  std::vector<Event> newErrors(plist::Dictionary& counted);
  /// The ID of the boot in which the controllers in that folder have counted. A root that has
  /// controllers of its own shares neither the machine's errors nor its boots. Empty when unknown.
  std::string bootIDBeside(const std::string& controllers);

  const DeviceRoot& root_;
  FileSystem& files_;
  PropertyListCoding& propertyLists_;
  SystemLog& log_;
  Mode mode_;
  std::vector<Event> queue_;  // the next one is last; read again when empty
  bool hasLooked_ = false;
  int handedOut_ = 0;      // in this run
  std::string unfiled_;    // the file of the event handed out last; empty once that is filed
  Descriptor folderLock_;  // held during a run
};

}  // namespace tavrel
