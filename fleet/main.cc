#include <string>
#include <vector>

#include "base/program.h"
#include "fleet/fleet_tool.h"

int main(int argc, char** argv) {
  return tavrel::exitStatusOf("tavrel-fleet", [&] {
    return tavrel::fleet::runFleet(std::vector<std::string>(argv + 1, argv + argc),
                                   tavrel::standardStreams());
  });
}
