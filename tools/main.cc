#include <string>
#include <vector>

#include "base/program.h"
#include "tools/tavrelctl.h"

int main(int argc, char** argv) {
  return tavrel::exitStatusOf("tavrelctl", [&] {
    return tavrel::runTavrelctl(std::vector<std::string>(argv + 1, argv + argc),
                                tavrel::standardStreams());
  });
}
