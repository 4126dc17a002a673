#include "statsd/statsd_line.h"

#include <gtest/gtest.h>

#include "statsd/statsd_recorder.h"

namespace tavrel {
namespace {

// "NAME KIND VALUES @RATE", or what is wrong.
std::string parsed(std::string_view text) {
  StatsdLine line;
  switch (parseStatsdLine(text, line)) {
    case StatsdParse::Malformed:
      return "malformed";
    case StatsdParse::Unsupported:
      return "unsupported";
    case StatsdParse::Good:
      break;
  }
  constexpr const char* kKinds[] = {"counter", "gauge", "delta", "series"};
  std::ostringstream out;
  out << line.name << " " << kKinds[static_cast<int>(line.kind)];
  for (const StatsdValue& value : line.values) {
    out << " ";
    value.whole ? out << *value.whole : out << value.number;
  }
  if (line.rate != 1) out << " @" << line.rate;
  return out.str();
}

TEST(StatsdLine, IsParsedWithinItsBounds) {
  const std::pair<std::string_view, const char*> cases[] = {
      {"a:1|c", "a counter 1"},
      {"a.b-c d:-2.5|c|@0.1", "a.b-c d counter -2.5 @0.1"},
      {"a:+1e2|c|@1", "a counter 100"},
      {"a:7|g", "a gauge 7"},
      {"a:-7|g", "a delta -7"},
      {"a:+7|g", "a delta 7"},
      {"a:1|ms", "a series 1"},
      {"a:1|h|@0.5", "a series 1 @0.5"},
      {"a:1:2.5:-3|d", "a series 1 2.5 -3"},
      {"a:1|c|#t:1,u|@0.5|c:id|T1|e:x|card:low", "a counter 1 @0.5"},
      {"a,t=1:2|c", "a counter 2"},
      {"a;t=1:2|c", "a counter 2"},
      {"a:x|s", "unsupported"},
      {"_e{1,1}:a|b", "unsupported"},
      {"_sc|a|0", "unsupported"},
      {"", "malformed"},
      {"a", "malformed"},
      {"a:", "malformed"},
      {"a:1", "malformed"},
      {"a:1|", "malformed"},
      {"a:|c", "malformed"},
      {":1|c", "malformed"},
      {",t:1|c", "malformed"},
      {"a:1|C", "malformed"},
      {"a:1|cc", "malformed"},
      {"a:1|c|", "a counter 1"},
      {"a:1|c||", "malformed"},
      {"a:1|c|x", "malformed"},
      {"a:1|c|@0", "malformed"},
      {"a:1|c|@-1", "malformed"},
      {"a:1|c|@1.1", "malformed"},
      {"a:1|c|@", "malformed"},
      {"a:1|c|@nan", "malformed"},
      {"a:nan|c", "malformed"},
      {"a:inf|ms", "malformed"},
      {"a:1e999|c", "malformed"},
      {"a:9223372036854775808|c", "malformed"},
      {"a:9223372036854775808|g", "malformed"},
      {"a:-9223372036854775808|c", "a counter -9223372036854775808"},
      {"a:9223372036854775807|g|@0.5", "a gauge 9223372036854775807 @0.5"},
      {"a:+9007199254740993|g", "a delta 9007199254740993"},
      {"a:1:-9007199254740993:0.5|c", "a counter 1 -9007199254740993 0.5"},
      {"a:9007199254740993|c|@0.5", "a counter 9.0072e+15 @0.5"},
      {"a:9007199254740993|ms", "a series 9.0072e+15"},
      {"a:9223372036854775807|c|@0.5", "malformed"},
      {"a:++1|g", "malformed"},
      {"a:1e18|c|@0.1", "malformed"},
      {"a:1e18|g|@0.1", "a gauge 1e+18 @0.1"},
      {"a:1:-1e30|c", "malformed"},
      {"a:+1e30|g", "malformed"},
      {"a:1e30|ms", "a series 1e+30"},
      {"a:+-1|g", "malformed"},
      {"a:1:2|g", "malformed"},
      {"a:+1:2|g", "malformed"},
      {"a:1x|c", "malformed"},
      {"a: 1|c", "malformed"},
      {"a:1:|c", "a counter 1"},
      {"a::1|c", "malformed"},
      {std::string_view("a:1\0|c", 6), "malformed"},
  };
  for (const auto& [text, expected] : cases)
    EXPECT_EQ(parsed(text), expected) << text;
}

TEST(StatsdNames, BecomeKeys) {
  std::string key = "p.";
  appendStatsdKey(key, "aZ09._-/ :\n\xc3\xa4");
  EXPECT_EQ(key, "p.aZ09._-______");
  EXPECT_TRUE(isStatsdPrefix(""));
  EXPECT_TRUE(isStatsdPrefix(std::string(200, 'p')));
  EXPECT_FALSE(isStatsdPrefix(std::string(201, 'p')));
  EXPECT_FALSE(isStatsdPrefix("a b"));
}

}  // namespace
}  // namespace tavrel
