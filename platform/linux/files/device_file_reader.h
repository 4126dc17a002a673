// Files below the device root.
#pragma once

#include "platform/file_reader.h"
#include "platform/linux/files/device_root.h"
#include "platform/linux/files/file_system.h"

namespace tavrel {

class DeviceFileReader final : public FileReader {
 public:
  DeviceFileReader(const DeviceRoot& root, FileSystem& files) : root_(root), files_(files) {}

  Expected<std::string> read(std::string_view path, std::size_t largest) override {
    return files_.read(root_.path(path), largest);
  }
  std::optional<std::int64_t> size(std::string_view path) override {
    const auto status = FileSystem::status(root_.path(path));
    if (!status) return std::nullopt;
    return std::int64_t{status->st_size};
  }

 private:
  const DeviceRoot& root_;
  FileSystem& files_;
};

}  // namespace tavrel
