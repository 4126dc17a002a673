#include "platform/linux/recorded/recording_folder.h"

#include <utility>

#include "platform/linux/files/property_list_file.h"

namespace tavrel {
namespace {

constexpr std::string_view kEnding = ".plist";

}  // namespace

std::vector<RecordingFolder::Stamp> RecordingFolder::stampFiles() {
  const std::string folder = root_.path(kRecordingFolder);
  const auto names = files_.list(folder);
  const std::string complaint = names ? std::string() : names.error().message;
  if (complaint != complaint_) {
    complaint_ = complaint;
    if (!names) log_.write(LogLevel::Error, complaint);
  }
  std::vector<Stamp> stamps;
  if (!names) return stamps;
  for (const std::string& name : *names) {
    if (!name.ends_with(kEnding)) continue;
    std::string path = folder + '/' + name;
    // A file removed since the listing is not a part.
    const auto status = FileSystem::status(path);
    if (!status) continue;
    stamps.push_back({std::move(path), status->st_dev, status->st_ino, status->st_size,
                      status->st_mtim.tv_sec, status->st_mtim.tv_nsec});
  }
  return stamps;
}

// Stamps are taken before the files are read: a file replaced in between is read again by the next
// update.
bool RecordingFolder::update(std::vector<RecordingPart>& parts) {
  std::vector<Stamp> stamps = stampFiles();
  if (stamps == stamps_) return false;
  std::vector<RecordingPart> updated;
  std::size_t known = 0;  // both lists are sorted by name
  for (const Stamp& stamp : stamps) {
    while (known < stamps_.size() && stamps_[known].path < stamp.path)
      ++known;
    if (known < stamps_.size() && stamps_[known] == stamp) {
      updated.push_back(parts[known]);
    } else {
      updated.push_back({stamp.path, readDictionaryFile(files_, propertyLists_, log_, stamp.path)});
    }
  }
  stamps_ = std::move(stamps);
  parts = std::move(updated);
  return true;
}

}  // namespace tavrel
