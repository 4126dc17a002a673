// tavrelctl export openmetrics
#include "base/bytes.h"
#include "device.h"
#include "ioreport/elements.h"
#include "platform/plist/coding.h"
#include "tools/export/metric_page.h"

namespace tavrel {
namespace {

// The program's exit status; -1 when there is no such program.
int statusOf(const std::string& command) {
  const int status = std::system(command.c_str());
  return !WIFEXITED(status) ? 1 : WEXITSTATUS(status) == 127 ? -1 : WEXITSTATUS(status);
}

std::string linesWith(const std::string& page, std::string_view begin) {
  std::istringstream lines(page);
  std::string found;
  for (std::string line; std::getline(lines, line);)
    if (line.starts_with(begin)) found += line + '\n';
  return found;
}

TEST(LabelTest, AreDifferentForDifferentBytes) {
  const std::pair<std::string, std::string> kCases[] = {
      {"com.example.a", "com.example.a"},
      {"a\\b\"c", "a\\b\"c"},
      {"ü\n\x7f\xff", "ü%0A%7F%FF"},
      {"%0A", "%250A"},
      {"\xC2\x85", "%C2%85"},
      {std::string(1, '\0'), "%00"},
      {std::string(256, 'x'), std::string(256, 'x')}};
  for (const auto& [bytes, value] : kCases)
    EXPECT_EQ(labelValue(bytes), value);
  const std::string cut = labelValue(std::string(1000, 'x'));
  EXPECT_LE(cut.size(), kLongestLabel);
  EXPECT_NE(cut, labelValue(std::string(1001, 'x')));
  EXPECT_NE(cut, labelValue(cut));
  EXPECT_TRUE(labelValue(std::string(300, '\xff')).find("%~") > 200);
}

TEST(MetricPageTest, WritesFamiliesAsBothFormatsHaveThem) {
  MetricPage page, full;
  page.gauge({"b_bytes", "bytes", "Bytes."}, {{"k", "2"}}, 0.5);
  page.gauge({"b_bytes", "bytes", "Bytes."}, {{"k", "1\"\\"}}, std::int64_t{9007199254740993});
  page.gauge({"b_bytes", "bytes", "Bytes."}, {{"k", "2"}}, 7.0);  // the labels are already used
  page.summary({"c", "", "Summary."}, {}, {3, 1.5, {{0.5, 1}, {1, -0.0}}});
  page.histogram({"a", "", "Histogram."}, {{"k", "x"}},
                 {{{1, 2}, {2.5, 3}, {std::numeric_limits<double>::infinity(), 4}}, 9.0});
  EXPECT_EQ(page.leftOut(), 1U);
  EXPECT_EQ(page.text(),
            "# TYPE a histogram\n# HELP a Histogram.\n"
            "a_bucket{k=\"x\",le=\"1.0\"} 2\na_bucket{k=\"x\",le=\"2.5\"} 3\n"
            "a_bucket{k=\"x\",le=\"+Inf\"} 4\na_sum{k=\"x\"} 9\na_count{k=\"x\"} 4\n"
            "# TYPE b_bytes gauge\n# UNIT b_bytes bytes\n# HELP b_bytes Bytes.\n"
            "b_bytes{k=\"1\\\"\\\\\"} 9007199254740993\nb_bytes{k=\"2\"} 0.5\n"
            "# TYPE c summary\n# HELP c Summary.\n"
            "c{quantile=\"0.5\"} 1\nc{quantile=\"1.0\"} -0\nc_sum 1.5\nc_count 3\n# EOF\n");
  for (std::size_t i = 0; i <= MetricPage::kMetrics; ++i)
    full.gauge({"a", "", "Many."}, {{"k", std::to_string(i)}}, 0.0);
  EXPECT_EQ(full.leftOut(), 1U);
}

TEST(ExportTest, IsAcceptedByBothParsers) {
  const TemporaryDevice device;
  for (const char* file : {"report.plist", "live/guest.plist"}) {
    std::string name(file);
    std::ranges::replace(name, '/', '-');
    device.write("/var/lib/tavrel/registry/" + name,
                 contentOf(std::string(TAVREL_EXAMPLES "/registry/") + file));
  }
  device.writeDrive("nvme0", "nvme", R"("temperature": 41500, "written": 512, "used_pct": 3)",
                    "2026-01-01T00:00:00Z",
                    R"("model": "M\"\n", "capacity": 4096, "growth": {"written": 5}, )");
  std::string lines =
      "scalar\ttoday\tcom.example.s\t9007199254740993\n"
      "scalar\tyesterday\tcom.example.y\t1\n"
      "scalar\ttoday\tcom.example.\"\\%\t-5\n"
      "scalar\ttoday\t" +
      std::string(1000, 'k') +
      "\t1\n"
      "scalar\ttoday\t" +
      std::string(1001, 'k') + "\t2\n";
  for (int i = 1; i <= 100; ++i)
    lines += "value\ttoday\tcom.example.d\t1\t" + std::to_string(i) + "\n";
  for (const char* value : {"-3", "nan", "inf", "2"})
    lines += std::string("value\ttoday\tcom.example.n\t1\t") + value + "\n";
  EXPECT_EQ(device.run("stat import -", lines).status, 0);

  const std::string file = device.path("/tavrel.prom");
  device.check("export openmetrics -o " + file, prints(""));
  const std::string page = contentOf(file);
  EXPECT_TRUE(page.ends_with("\n# EOF\n"));
  EXPECT_EQ(linesWith(page, "tavrel_distribution{") + linesWith(page, "tavrel_distribution_"),
            "tavrel_distribution{key=\"com.example.d\",quantile=\"0.05\"} 5\n"
            "tavrel_distribution{key=\"com.example.d\",quantile=\"0.25\"} 25\n"
            "tavrel_distribution{key=\"com.example.d\",quantile=\"0.5\"} 50\n"
            "tavrel_distribution{key=\"com.example.d\",quantile=\"0.75\"} 75\n"
            "tavrel_distribution{key=\"com.example.d\",quantile=\"0.95\"} 95\n"
            "tavrel_distribution{key=\"com.example.d\",quantile=\"0.99\"} 99\n"
            "tavrel_distribution_sum{key=\"com.example.d\"} 5050\n"
            "tavrel_distribution_count{key=\"com.example.d\"} 100\n"
            "tavrel_distribution_maximum{key=\"com.example.d\"} 100\n"
            "tavrel_distribution_maximum{key=\"com.example.n\"} +Inf\n"
            "tavrel_distribution_mean{key=\"com.example.d\"} 50.5\n"
            "tavrel_distribution_mean{key=\"com.example.n\"} +Inf\n"
            "tavrel_distribution_minimum{key=\"com.example.d\"} 1\n"
            "tavrel_distribution_minimum{key=\"com.example.n\"} -3\n"
            "tavrel_distribution_values{key=\"com.example.n\"} 3\n");
  EXPECT_EQ(linesWith(page, "tavrel_scalar{key=\"com."),
            "tavrel_scalar{key=\"com.example.\\\"\\\\%25\"} -5\n"
            "tavrel_scalar{key=\"com.example.s\"} 9007199254740993\n");
  EXPECT_EQ(linesWith(page, "tavrel_disk_figure"),
            "tavrel_disk_figure{disk=\"nvme0\",figure=\"used_pct\"} 3\n"
            "tavrel_disk_figure_bytes{disk=\"nvme0\",figure=\"written\"} 512\n"
            "tavrel_disk_figure_bytes{disk=\"nvme0\",figure=\"written_growth\"} 5\n"
            "tavrel_disk_figure_celsius{disk=\"nvme0\",figure=\"temperature\"} 41.5\n");
  expectIn(page, {"\ntavrel_channel_distribution_seconds_sum{driver=\"flash0 <id "
                  "0x100000201>\",group=\"NAND\","
                  "subgroup=\"Latency\",channel=\"Read latency\"} 0.02613\n"
                  "tavrel_channel_distribution_seconds_count{driver=\"flash0 <id "
                  "0x100000201>\",group=\"NAND\","
                  "subgroup=\"Latency\",channel=\"Read latency\"} 750\n",
                  "tavrel_check_state{check=\"queue\",subject=\"pending\"} 0\n"});
  EXPECT_EQ(linesWith(page, "tavrel_metrics_left_out"), "tavrel_metrics_left_out 0\n");
  EXPECT_EQ(linesWith(device.run("export openmetrics --day yesterday").out, "tavrel_scalar"),
            "tavrel_scalar{key=\"com.example.y\"} 1\n");

  const std::string errors = device.path("/errors");
  const int openMetrics = statusOf(
      "/usr/bin/python3 -c 'import prometheus_client' 2>/dev/null || exit 127; /usr/bin/python3 -c "
      "'from prometheus_client.openmetrics.parser import text_string_to_metric_families as parse; "
      "list(parse(open(\"" +
      file + "\").read()))' 2> " + errors);
  const int prometheus =
      statusOf(TAVREL_PROMTOOL " check metrics < " + file + " > " + errors + "2 2>&1");
  EXPECT_LE(openMetrics, 0) << contentOf(errors);
  EXPECT_LE(prometheus, 0) << contentOf(errors + "2");
  if (openMetrics < 0) GTEST_SKIP() << "install python3-prometheus-client to check the format";
  if (prometheus < 0) GTEST_SKIP() << "script/promtool build/promtool fetches promtool";
  EXPECT_EQ(contentOf(errors + "2"), "");
}

TEST(ExportTest, AHistogramWithoutASumIsAGauge) {
  const TemporaryDevice device;
  const auto recording =
      plist::read(asBytes(contentOf(TAVREL_EXAMPLES "/registry/report.plist")))->dictionary();
  plist::Dictionary channel = recording.dictionary("Hub").array("Channels").at(2).dictionary();
  const ByteSpan recorded = channel.array("Elements").at(0).data().bytes();
  std::vector<std::byte> bytes(recorded.begin(), recorded.end());
  storeLittle64(bytes, 3 * kElementBytes + 56, std::uint64_t{1} << 63);  // of a bucket with values
  channel.set("Elements", plist::Data(bytes));
  device.write("/var/lib/tavrel/registry/a.plist", *plist::writeXml(recording));
  expectIn(device.run("export openmetrics").out,
           {"\ntavrel_channel_values{driver=\"flash0 <id 0x100000201>\",group=\"NAND\",subgroup="
            "\"Latency\",channel=\"Read latency\",up_to=\"+Inf\",unit=\"seconds\"} 750\n"});
}

}  // namespace
}  // namespace tavrel
