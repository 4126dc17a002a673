// A device root whose files are in memory.
#pragma once

#include <string>
#include <string_view>

#include "memory_files.h"
#include "platform/linux/files/device_root.h"

namespace tavrel::fuzz {

/// Destroyed with all its files, so that an input never sees what an earlier one left.
class Tree {
 public:
  Tree() : root(MemoryFiles::all().makeRoot()) {}
  ~Tree() { MemoryFiles::all().removeAll(root.path("")); }
  Tree(const Tree&) = delete;
  Tree& operator=(const Tree&) = delete;

  void write(std::string_view path, std::string_view content) {
    MemoryFiles::all().put(root.path(path), content);
  }

  const DeviceRoot root;
};

}  // namespace tavrel::fuzz
