// What a run over an overlay reads, would write, and logs: one event at a time.
#pragma once

#include <cstdint>
#include <functional>
#include <string>
#include <utility>

#include "base/plist.h"

namespace tavrel {

struct OverlayEvent {
  enum class Kind : std::uint8_t {
    // Reads. The value is the result, null for nothing.
    Preference,      // "domain key"
    File,            // its path; its size in bytes, or why it cannot be read
    Answer,          // a question to the device
    Control,         // a system control; data, or the error as text
    Fact,            // about the device, by its name
    Library,         // a library or a function of it; whether it was found
    Statistics,      // "scalars of day 20000"; the number of rows
    Driver,          // the class or name of a driver; whether it was found
    Drivers,         // the drivers looked for; the outcome
    DriverProperty,  // "driver key"; for a container, its kind
    DriverCall,      // "driver method 8"; the outcome
    // Changes. The value is what would be written.
    SetPreference,     // "domain key"
    RemovePreference,  // "domain key"
    WritePreferences,  // a domain that would be written to storage
    SetScalar,         // its key
    Checkpoint,
    Record,      // "type 176"; the record
    Submission,  // the log's name; a dictionary of "type", "bytes", "options" and "content"
    SendOn,      // what would leave the pending folder
    Notification,
    CleanUp,   // what would be removed, and its files
    RollOver,  // what would be rolled over
    // Messages.
    LogLine,    // the level's name; the message
    ErrorText,  // standard error; the exact text, with or without a line end
    OutputText,
  };

  Kind kind;
  std::string subject;
  plist::Value value;
};

/// Delivers events as they happen. Once the handler has returned, the run may change the value.
class OverlayEvents {
 public:
  using Handler = std::function<void(const OverlayEvent&)>;

  void setHandler(Handler handler) { handler_ = std::move(handler); }
  void deliver(OverlayEvent::Kind kind, std::string subject, plist::Value value = {}) const {
    if (handler_) handler_({kind, std::move(subject), std::move(value)});
  }

 private:
  Handler handler_;
};

}  // namespace tavrel
