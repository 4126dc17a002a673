// Files below the device root.
#pragma once

#include "platform/files.h"
#include "platform/linux/device_root.h"
#include "platform/linux/file_layer.h"

namespace tavrel {

class LinuxFiles final : public Files {
 public:
  LinuxFiles(const DeviceRoot& root, FileLayer& files) : root_(root), files_(files) {}

  Expected<std::string> read(std::string_view path, std::size_t largest) override {
    return files_.read(root_.path(path), largest);
  }
  std::optional<std::int64_t> size(std::string_view path) override {
    const auto status = FileLayer::status(root_.path(path));
    if (!status) return std::nullopt;
    return std::int64_t{status->st_size};
  }

 private:
  const DeviceRoot& root_;
  FileLayer& files_;
};

}  // namespace tavrel
