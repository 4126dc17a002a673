#include "platform/linux/recorded/shared_buffer.h"

#include <cerrno>
#include <fcntl.h>
#include <sys/mman.h>

#include "base/format.h"
#include "platform/linux/files/system_error.h"

namespace tavrel {
namespace {

class Mapping final : public MappedMemory {
 public:
  explicit Mapping(MemoryRange range) : range_(std::move(range)) {}
  ByteSpan bytes() const override { return range_.bytes(); }

 private:
  MemoryRange range_;
};

Error failure(std::string_view what, std::size_t size, int code) {
  return systemError(what, format("shared memory of %zu bytes", size), code);
}

Expected<MemoryRange> mapFile(const Descriptor& file, std::size_t size, int protection) {
  void* const address = mmap(nullptr, size, protection, MAP_SHARED, file.get(), 0);
  if (address == MAP_FAILED) return failure("map", size, errno);
  return MemoryRange(address, size);
}

}  // namespace

MemoryRange::~MemoryRange() {
  if (address_) munmap(address_, size_);
}

Expected<SharedBuffer> SharedBuffer::create(std::size_t size) {
  Descriptor file(memfd_create("tavrel-reports", MFD_CLOEXEC));
  if (!file) return failure("make", size, errno);
  int code = EINTR;
  while (code == EINTR)
    code = posix_fallocate(file.get(), 0, static_cast<off_t>(size));
  if (code != 0) return failure("make", size, code);
  auto range = mapFile(file, size, PROT_READ | PROT_WRITE);
  if (!range) return range.error();
  return SharedBuffer(std::move(file), *std::move(range));
}

Expected<std::unique_ptr<MappedMemory>> SharedBuffer::map() const {
  auto range = mapFile(file_, bytes().size(), PROT_READ);
  if (!range) return range.error();
  return std::unique_ptr<MappedMemory>(std::make_unique<Mapping>(*std::move(range)));
}

}  // namespace tavrel
