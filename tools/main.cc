#include <cstdio>
#include <cstdlib>
#include <exception>
#include <iostream>
#include <optional>
#include <string>
#include <string_view>
#include <sys/ioctl.h>
#include <unistd.h>
#include <vector>

#include "tools/tavrelctl.h"

namespace {

// Nothing when standard output is not a terminal; a terminal of unknown width counts as 80 columns.
std::optional<std::size_t> terminalColumns() {
  if (!isatty(STDOUT_FILENO)) return std::nullopt;
  winsize size{};
  if (ioctl(STDOUT_FILENO, TIOCGWINSZ, &size) != 0 || size.ws_col == 0) return 80;
  return size.ws_col;
}

// NO_COLOR as no-color.org describes it.
bool isColoured() {
  if (!isatty(STDOUT_FILENO)) return false;
  const char* const refusal = std::getenv("NO_COLOR");
  const char* const terminal = std::getenv("TERM");
  return (refusal == nullptr || *refusal == '\0') && terminal != nullptr &&
         std::string_view(terminal) != "dumb";
}

}  // namespace

int main(int argc, char** argv) try {
  std::ios::sync_with_stdio(false);
  return tavrel::runTavrelctl(std::vector<std::string>(argv + 1, argv + argc),
                              {.in = std::cin,
                               .out = std::cout,
                               .error = std::cerr,
                               .columns = terminalColumns(),
                               .errorIsTerminal = isatty(STDERR_FILENO) == 1,
                               .inIsTerminal = isatty(STDIN_FILENO) == 1,
                               .outIsColoured = isColoured()});
} catch (const std::exception&) {
  // What else goes wrong has been said; a message takes memory, of which there is none left.
  std::fputs("tavrelctl: out of memory\n", stderr);
  return 1;
}
