#include <cstdio>
#include <exception>
#include <string>
#include <vector>

#include "fleet/fleet_tool.h"

int main(int argc, char** argv) try {
  return tavrel::fleet::runFleet(std::vector<std::string>(argv + 1, argv + argc),
                                 tavrel::standardStreams());
} catch (const std::exception&) {
  // Other failures have been reported. A formatted message would take memory, and none is left.
  std::fputs("tavrel-fleet: out of memory\n", stderr);
  return 1;
}
