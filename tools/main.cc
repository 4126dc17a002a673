#include <cstdio>
#include <exception>
#include <string>
#include <vector>

#include "tools/tavrelctl.h"

int main(int argc, char** argv) try {
  return tavrel::runTavrelctl(std::vector<std::string>(argv + 1, argv + argc),
                              tavrel::standardStreams());
} catch (const std::exception&) {
  // Other failures have been reported. A formatted message would take memory, and none is left.
  std::fputs("tavrelctl: out of memory\n", stderr);
  return 1;
}
