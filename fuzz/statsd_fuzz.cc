// Datagrams of StatsD lines, passed through their parser and the recorder.
//
// Nothing is recorded: libbrimhold finds no folder for it, so the statistics of the machine that
// fuzzes stay as they are.
#include <cmath>
#include <cstdint>
#include <cstdlib>

#include "require.h"
#include "statsd/statsd_line.h"
#include "statsd/statsd_recorder.h"

namespace {

using tavrel::fuzz::require;

void checkLine(std::string_view text) {
  tavrel::StatsdLine line;
  if (tavrel::parseStatsdLine(text, line) != tavrel::StatsdParse::Good) return;
  require(!line.name.empty() && text.starts_with(line.name));
  require(!line.values.empty() && line.values.size() <= text.size());
  for (const tavrel::StatsdValue& value : line.values) {
    require(std::isfinite(value.number));
    require(!value.whole || static_cast<double>(*value.whole) == value.number);
  }
  require(line.rate > 0 && line.rate <= 1);

  std::string key;
  tavrel::appendStatsdKey(key, line.name);
  require(key.size() == line.name.size());
  require(key.size() > 200 || tavrel::isStatsdPrefix(key));
}

}  // namespace

extern "C" int LLVMFuzzerInitialize(int*, char***) {
  return setenv("TAVREL_ROOT", "/nonexistent", 1);
}

extern "C" int LLVMFuzzerTestOneInput(const std::uint8_t* data, std::size_t size) {
  const std::string_view datagram(reinterpret_cast<const char*>(data), size);
  checkLine(datagram.substr(0, datagram.find('\n')));
  tavrel::StatsdRecorder recorder("fuzz.");
  recorder.take(datagram);
  return 0;
}
