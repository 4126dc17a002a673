// A service of a recording.
#pragma once

#include <cstddef>
#include <memory>

#include "platform/driver_registry.h"
#include "platform/linux/recorded/recording.h"
#include "platform/system_log.h"

namespace tavrel {

class RecordedService final : public DriverService {
 public:
  /// The service at `position` of the recording. The log must outlive it and its connections.
  RecordedService(std::shared_ptr<const Recording> recording, std::size_t position, SystemLog& log);

  KernelReturn entryID(std::uint64_t& id) override;
  /// Longer names are cut at 127 characters.
  KernelReturn name(std::string& name) override;
  std::uint32_t userRetainCount() override;
  plist::Value property(std::string_view key) override;
  /// Searches the service itself, then its parents, then theirs, each generation in recorded order,
  /// and no service twice.
  plist::Value searchProperty(std::string_view plane, std::string_view key) override;
  /// The only type of connection is 0.
  KernelReturn open(std::uint32_t type, std::unique_ptr<UserClient>& client) override;

 private:
  const std::shared_ptr<const Recording> recording_;
  const RecordedEntry& entry_;
  SystemLog& log_;
};

}  // namespace tavrel
