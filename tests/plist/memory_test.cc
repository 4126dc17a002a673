#include <cstdlib>
#include <gtest/gtest.h>
#include <limits>
#include <new>

#include "platform/plist/binary.h"
#include "platform/plist/coding.h"
#include "platform/plist/xml.h"

namespace {
std::size_t allocationsLeft = std::numeric_limits<std::size_t>::max();
}

[[gnu::noinline]] void* operator new(std::size_t size) {
  void* const memory = allocationsLeft-- == 0 ? nullptr : std::malloc(size);
  return memory ? memory : throw std::bad_alloc();
}
[[gnu::noinline]] void operator delete(void* memory) noexcept {
  std::free(memory);
}
[[gnu::noinline]] void operator delete(void* memory, std::size_t) noexcept {
  std::free(memory);
}

namespace tavrel::plist {
namespace {

TEST(Memory, ThatIsShortIsNoErrorOfTheDocument) {
  const Value value = Dictionary{{"a longer key than a string holds itself", Array{1, "x"}}};
  for (const std::string& document : {*writeXml(value), *writeBinary(value)}) {
    int failures = 0;
    for (bool failed = true; failed; failures += failed) {
      try {
        allocationsLeft = static_cast<std::size_t>(failures);
        const auto read = plist::read(asBytes(document));
        allocationsLeft = std::numeric_limits<std::size_t>::max();
        failed = false;
        EXPECT_TRUE(read && *read == value);
      } catch (const std::bad_alloc&) {
      }
    }
    EXPECT_GT(failures, 4);
  }
}

}  // namespace
}  // namespace tavrel::plist
