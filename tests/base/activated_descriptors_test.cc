#include "base/activated_descriptors.h"

#include <cstdlib>
#include <gtest/gtest.h>

namespace tavrel {
namespace {

TEST(ActivatedDescriptors, AreForOneProcess) {
  const struct {
    const char* process;
    const char* count;
    int expected;
  } cases[] = {{"12", "2", 2},   {"12", "1000000", 1'000'000},
               {"13", "2", 0},   {"12", "0", 0},
               {"12", "-1", 0},  {"12", "2x", 0},
               {"12x", "2", 0},  {"12", "", 0},
               {"12", " 2", 0},  {"12", "2147483648", 0},
               {"", "2", 0},     {"12", nullptr, 0},
               {nullptr, "2", 0}};
  for (const auto& [process, count, expected] : cases) {
    process ? setenv("LISTEN_PID", process, 1) : unsetenv("LISTEN_PID");
    count ? setenv("LISTEN_FDS", count, 1) : unsetenv("LISTEN_FDS");
    EXPECT_EQ(activatedDescriptors(12), expected)
        << (process ? process : "none") << ", " << (count ? count : "none");
  }
  unsetenv("LISTEN_PID");
  unsetenv("LISTEN_FDS");
}

}  // namespace
}  // namespace tavrel
