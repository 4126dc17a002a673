// The device-answers query, answered from /etc/tavrel/device-answers.plist: a dictionary from
// question to answer. Without an entry "DiskUsage", the answer comes from the file system that
// holds, or would hold, the data folder /var/mobile.
#pragma once

#include <optional>

#include "platform/device_answers.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"
#include "platform/property_list_coding.h"
#include "platform/system_log.h"

namespace tavrel {

class FileDeviceAnswers final : public DeviceAnswers {
 public:
  FileDeviceAnswers(const DeviceRoot& root, FileSystem& files, PropertyListCoding& propertyLists,
                    SystemLog& log)
      : root_(root), files_(files), propertyLists_(propertyLists), log_(log) {}

  plist::Value SQCopyAnswer(std::string_view question) override;

 private:
  plist::Value diskUsage() const;

  const DeviceRoot& root_;
  FileSystem& files_;
  PropertyListCoding& propertyLists_;
  SystemLog& log_;
  std::optional<plist::Dictionary> answers_;
};

}  // namespace tavrel
