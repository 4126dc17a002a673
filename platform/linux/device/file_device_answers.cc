#include "platform/linux/device/file_device_answers.h"

#include <cerrno>
#include <sys/statvfs.h>

#include "base/arithmetic.h"
#include "platform/linux/files/property_list_file.h"
#include "platform/linux/files/system_error.h"

namespace tavrel {
namespace {

constexpr std::string_view kAnswersFile = "/etc/tavrel/device-answers.plist";
constexpr std::string_view kDataFolders[] = {"/var/mobile", "/var", "/"};

}  // namespace

plist::Value FileDeviceAnswers::SQCopyAnswer(std::string_view question) {
  if (!answers_) {
    answers_ = readDictionaryFile(files_, propertyLists_, log_, root_.path(kAnswersFile));
  }
  plist::Value answer = plist::deepCopy(answers_->get(question));
  if (answer.isNull() && question == "DiskUsage") return diskUsage();
  return answer;
}

plist::Value FileDeviceAnswers::diskUsage() const {
  for (const std::string_view folder : kDataFolders) {
    struct statvfs status {};
    if (statvfs(root_.path(folder).c_str(), &status) != 0) {
      if (errno == ENOENT) continue;
      log_.write(LogLevel::Error, systemError("measure", root_.path(folder)).message);
      return {};
    }
    const auto capacity = checkedMultiply(status.f_blocks, status.f_frsize);
    const auto available = checkedMultiply(status.f_bavail, status.f_frsize);
    auto usage = plist::Dictionary::create();
    if (capacity) usage.set(kSQQDiskUsageTotalDiskCapacity, static_cast<std::int64_t>(*capacity));
    if (available)
      usage.set(kSQQDiskUsageTotalDataAvailable, static_cast<std::int64_t>(*available));
    return usage;
  }
  return {};
}

}  // namespace tavrel
