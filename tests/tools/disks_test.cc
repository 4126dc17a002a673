// tavrelctl disks
#include "device.h"

namespace tavrel {
namespace {

TEST(DisksTest, ShowsReadingsAndWhatSysfsTells) {
  const TemporaryDevice device;
  device.write("/proc/sys/kernel/random/boot_id", "b1\n");
  device.write("/sys/class/ubi/ubi0/max_ec", "9\n");
  device.write("/sys/class/ubi/ubi0/mtd_num", "0\n");
  device.writeDrive("nvme0", "nvme", R"("used_pct": 255, "written": 1024, "unheard_of": 1)",
                    "2000-01-01T00:00:00Z", R"("model": "Disk", "firmware": "1",
      "capacity": 1048576, "boot": "b0", "from": "log 02h", "growth": {"written": 5}, )");
  const auto json = device.json("disks --all", {}, 16 | 64);
  const auto nvme = json["disks"][0], ubi = json["disks"][1];
  EXPECT_EQ(nvme["figures"], (nlohmann::json{{"used_pct", 255}, {"written", 1024}}));
  EXPECT_EQ(nvme["growth"], (nlohmann::json{{"written", 5}}));
  EXPECT_EQ(nvme["verdict"], "worn");
  EXPECT_EQ(nvme["sources"][2]["name"], "nvme0.written_growth");
  EXPECT_EQ(ubi["figures"], (nlohmann::json{{"erases_max", 9}}));
  EXPECT_EQ(nvme["time"], "2000-01-01T00:00:00Z");
  EXPECT_EQ(ubi["age_seconds"], 0);
  expectIn(device.run("disks").out,
           {"nvme0: read before the last start of the system\n", " 255 % "});

  device.write("/run/tavrel/health/nvme0.plist", "garbage");
  const Outcome broken = device.run("disks");
  EXPECT_EQ(broken.status, 1);
  expectIn(broken.error, {"cannot use reading " + device.path("/run/tavrel/health/nvme0")});
}

TEST(DisksTest, ADriveThatWasNeverReadHasNoAge) {
  const TemporaryDevice device;
  device.write("/sys/class/nvme/nvme0/model", "Disk");
  device.writeDrive("card\xc2\x9b", "emmc", R"("life_a_pct": 10, "life_b_pct": 110)");
  const auto nvme = device.json("disks", {}, 4 | 16 | 64)["disks"][0];
  EXPECT_EQ(nvme["time"], nullptr);
  EXPECT_EQ(nvme["age_seconds"], nullptr);
  const std::string text = device.run("disks --all").out;
  expectIn(text, {"  -  unknown\n", "  110 % ", "card\\xc2\\x9b: life_b_pct is 110\n"});
  EXPECT_EQ(text.find('\xc2'), std::string::npos);
  expectIn(device.run("status --check").out, {"UNKNOWN disk nvme0: unknown, not read yet\n"});
  const std::string metrics = device.run("export openmetrics").out;
  expectIn(metrics, {"tavrel_disk_reading_timestamp_seconds{disk=\"card"});
  EXPECT_EQ(metrics.find("timestamp_seconds{disk=\"nvme0\"}"), std::string::npos);
  const std::string page = device.run("page -o -").out;
  expectIn(page, {"not read yet"});
  EXPECT_EQ(page.find("0 s ago"), std::string::npos);
}

}  // namespace
}  // namespace tavrel
