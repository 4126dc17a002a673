// One facility of the kernel: the channels that it publishes and the files that hold their values.
//
// Values are kept in slots. A file fills a range of slots; a channel shows one slot, an array of
// them, or for each state of a residency two: first the entries of all states, then their
// residencies. A value missing from a reading is `kUnset`, and its channel is absent.
//
//   LiveSource source("LinuxSwap", "swap");
//   const std::uint32_t slot = source.addNumberFile(path, {.multiply = 1024});
//   source.addSimple({"Swap", "", kBytes}, "swap.used", slot);
#pragma once

#include <cstdint>
#include <functional>
#include <memory>
#include <span>
#include <string>
#include <string_view>
#include <unordered_set>
#include <vector>

#include "base/plist.h"
#include "platform/linux/live/kernel_file.h"
#include "platform/linux/live/kernel_text.h"
#include "platform/report_protocol.h"
#include "platform/report_units.h"

namespace tavrel::live {

using namespace units;

inline constexpr std::uint16_t kToolCategory = 0x0001;
inline constexpr std::uint16_t kDailyCategory = 0x0100;

/// Where a channel is filed, and its unit.
struct Place {
  std::string_view group;
  std::string_view subGroup;
  Unit unit;
};

struct LiveChannel {
  std::string name;
  std::uint64_t id;
  std::uint8_t format;
  std::uint16_t categories;
  std::uint16_t elements;
  std::uint32_t firstSlot;
  std::uint32_t slots;
  std::int32_t states = -1;  // of a residency: its index in `residencies_`

  std::uint64_t type() const { return channelTypeOf(format, categories, elements); }
};

/// The states of a residency.
struct Residency {
  std::vector<std::uint64_t> ids;
  std::vector<std::int64_t> numbers;       // the kernel's numbers for them; may be empty
  std::uint32_t currentSlot = UINT32_MAX;  // holds the number of the current one
};

/// Interprets the text of a file.
class TextReader {
 public:
  virtual ~TextReader() = default;
  /// Fills `slots`, which are all `kUnset`, as far as the text has values.
  virtual void read(std::string_view text, std::span<std::int64_t> slots) const = 0;
};

/// How a file may be read.
enum class Speed : std::uint8_t {
  Quick,
  Slow,  // the device may be slow to answer: read last, and only for a bounded time
};

struct LiveFile {
  KernelFile file;
  std::uint32_t firstSlot;
  std::uint32_t slots;
  Scale scale;  // of a file with one number, which has no reader
  std::unique_ptr<const TextReader> reader;
  Speed speed = Speed::Quick;
  std::vector<std::string> powerStatus = {};  // files that say "suspended" while it may not be read
  bool isSilent = false;                      // its device is there, but sleeps or does not answer
};

class LiveSource {
 public:
  LiveSource(std::string_view className, std::string_view name)
      : className_(className), name_(name) {}

  // -- For builders of the source ----------------------------------------------------------------

  /// A file that holds one number. Returns its first slot, as the functions below do.
  std::uint32_t addNumberFile(std::string path, Scale scale = {}, Speed speed = Speed::Quick,
                              std::vector<std::string> powerStatus = {});
  /// A file whose text the reader splits into that many slots.
  std::uint32_t addTextFile(std::string path, std::uint32_t slots,
                            std::unique_ptr<const TextReader> reader, ReadMode mode);
  /// Values that a function measures, not read from a file of the kernel.
  std::uint32_t addMeasured(std::uint32_t slots,
                            std::function<void(std::span<std::int64_t>)> measure);

  void addSimple(const Place& place, std::string name, std::uint32_t slot,
                 std::uint16_t categories = kToolCategory);
  void addArray(const Place& place, std::string name, std::uint32_t firstSlot, std::uint32_t slots);
  /// `firstSlot` is the first of the states' entry counts.
  void addStates(const Place& place, std::string name, std::uint32_t firstSlot,
                 Residency residency);

  enum class Fold : std::uint8_t { Sum, Largest };
  /// A daily figure made of all slots that were added under its name. Devices that have gone do not
  /// count; while another one is silent, there is no sum.
  void addToFold(std::string_view name, Unit unit, Fold fold, std::uint32_t slot);
  /// A line for the system log about what is not shown.
  void note(std::string line) { notes_.push_back(std::move(line)); }
  const std::vector<std::string>& notes() const { return notes_; }
  /// Names in a folder, sorted, without "." and ".."; none when it is missing or this user may not
  /// read it. The first folder that cannot be listed for another reason is noted.
  std::vector<std::string> namesIn(const std::string& folder);
  /// Publishes the folds, in the order in which they were begun. Call this last.
  void publishFolds();

  // -- For samplers ------------------------------------------------------------------------------

  const std::string& className() const { return className_; }
  const std::string& name() const { return name_; }
  std::uint64_t driverID() const { return stableID(className_ + '/' + name_); }
  bool empty() const { return groups_.empty(); }

  /// The service, in the form of a recording.
  plist::Dictionary service() const;
  template <class Callback>
  void forEachChannel(const Callback& callback) const {
    for (const Group& group : groups_) {
      for (const LiveChannel& channel : group.channels)
        callback(channel);
    }
  }
  const Residency& residency(const LiveChannel& channel) const {
    return residencies_[static_cast<std::size_t>(channel.states)];
  }
  std::vector<LiveFile>& files() { return files_; }
  /// Marks the files that the channel needs in `wanted`, which has one flag for each.
  void want(const LiveChannel& channel, std::vector<bool>& wanted) const;
  /// Stores the values of a file's text; nothing when the device of the file has gone.
  void takeText(std::size_t file, std::optional<std::string_view> text);
  /// Notes that the device of a file sleeps or does not answer.
  void takeSilence(std::size_t file);
  /// Computes measured values and folds, after all wanted files have been read.
  void finish();
  std::span<const std::int64_t> slots() const { return slots_; }

 private:
  struct Group {
    std::string group;
    std::string subGroup;
    Unit unit;
    std::vector<LiveChannel> channels;
  };
  struct FoldedSlots {
    std::string name;
    Unit unit;
    Fold fold;
    std::vector<std::uint32_t> of;
    std::uint32_t slot = 0;
  };
  struct Measured {
    std::uint32_t firstSlot;
    std::uint32_t slots;
    std::function<void(std::span<std::int64_t>)> measure;
  };

  std::uint32_t addSlots(std::uint32_t count);
  bool isSilent(std::uint32_t slot) const;
  void add(const Place& place, LiveChannel channel);
  void wantSlots(std::uint32_t first, std::uint32_t count, std::vector<bool>& wanted) const;
  std::int64_t folded(const FoldedSlots& fold) const;

  std::string className_;
  std::string name_;
  std::vector<Group> groups_;
  std::vector<Residency> residencies_;
  std::vector<LiveFile> files_;  // by ascending slots
  std::vector<Measured> measured_;
  std::vector<FoldedSlots> folds_;
  std::vector<std::int64_t> slots_;
  std::unordered_set<std::uint64_t> ids_;
  std::vector<std::string> notes_;
  bool isListNoted_ = false;
};

}  // namespace tavrel::live
