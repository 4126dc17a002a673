#include "fleet/logs/log_reader.h"

#include <gtest/gtest.h>
#include <sstream>

#include "base/text.h"
#include "fleet/logs/limits.h"
#include "platform/plist/binary.h"
#include "platform/plist/xml.h"
#include "sample_log.h"

namespace tavrel::fleet {
namespace {

std::string textOf(const LogRecord& record) {
  std::ostringstream text;
  text << record.day << ' ' << record.created << " os '" << record.osVersion << "' before '"
       << record.previousOsVersion << "' config '" << record.configNumber << "' whitelist '"
       << record.whitelistDigest << "' task '" << record.taskID << "' languages '"
       << record.language << "' '" << record.preferredLanguage << "' region '" << record.region
       << "'\n";
  for (const auto& row : record.scalars)
    text << row.key << ' ' << row.value << '\n';
  for (const auto& [key, n] : record.distributions) {
    text << key << ' ' << numberText(n.minimum) << ' ' << numberText(n.maximum) << ' '
         << numberText(n.mean) << ' ' << numberText(n.squaredDeviations) << ' ' << n.count << '\n';
  }
  for (const auto& row : record.cells) {
    text << row.key << ' ' << row.label << ' ' << numberText(row.lower) << ' '
         << numberText(row.upper) << ' ' << row.count << '\n';
  }
  for (const auto& row : record.applications) {
    text << row.bundle << ' ' << row.version << ' ' << row.uuid << ' ' << row.orboID << ' '
         << row.arch << '\n';
  }
  return text.str();
}

std::string faultIn(std::string_view log) {
  const auto record = LogReader().read(asBytes(log), nullptr);
  return record ? "none" : record.error().message;
}

TEST(LogReaderTest, ReadsEachEncodingToTheSameRecord) {
  LogMetadata metadata;
  metadata.osVersion = "Pellio 4.2 (16R349)";
  metadata.configNumber = "CFG-7";
  const std::string expected =
      "20781 1795575845 os 'Pellio 4.2 (16R349)' before '' config 'CFG-7' whitelist "
      "'eb42570d2e2f7addc42403d203dafde4' task '' languages '' 'de-AT' region 'AT'\n"
      "app.a<b&c -9223372036854775808\n"
      "app.starts 12000\n"
      "app.delay 1 250 67.875 44257.1875 4\n"
      "app.load nan nan nan 0 1\n"
      "app.delay (-inf, 2.5] -inf 2.5 1\n"
      "app.delay (2.5, 100] 2.5 100 2\n"
      "app.delay (100, inf) 100 inf 1\n"
      "app.walk 1.2 8D1F6C0E-55B5-4B0A-9C6B-0D1A53F3A1C2 -7 3\n";
  const auto document = plist::readXml(asBytes(kSampleLog));
  ASSERT_TRUE(document);
  const std::string binary = *plist::writeBinary(*document);
  const std::string plainOrder = changed(kSampleLog, "<real>nan</real>", "<real>-nan</real>");
  const std::string forms[] = {
      kSampleLog,
      plainOrder,
      binary,
      gzipped(kSampleLog),
      gzipped(binary),
      // Two gzip members form one document.
      gzipped(kSampleLog.substr(0, 700)) + gzipped(kSampleLog.substr(700)),
      // Only a full XML reader accepts these.
      changed(kSampleLog, "<dict>", "<!-- a comment -->\r\n<dict>"),
      changed(kSampleLog, "app.starts", "app.st&#97;rts"),
      changed(kSampleLog, "<plist version", "<plist  version"),
      "\xEF\xBB\xBF" + kSampleLog,
      // Another order.
      changed(changed(kSampleLog, "\t\t<key>app.starts</key>\n\t\t<integer>12000</integer>\n", ""),
              "<key>BHScalars</key>\n\t<dict>\n",
              "<key>BHScalars</key>\n\t<dict>\n<key>app.starts</key>"
              "<integer>12000</integer>"),
      // Parts that are not read may be anything.
      changed(kSampleLog, "<array/>", "<array><dict><key>a</key><true/></dict></array>"),
  };
  LogReader reader;
  std::optional<std::array<std::byte, 32>> digest;
  for (const std::string& form : forms) {
    const auto record = reader.read(asBytes(form), &metadata);
    ASSERT_TRUE(record) << record.error().message << '\n' << form;
    EXPECT_EQ(textOf(*record), expected);
    if (!digest) digest = record->digest;
    EXPECT_EQ(record->digest, *digest);
  }
  EXPECT_EQ(reader.read(asBytes(kSampleLog), nullptr)->digest, *digest);
  metadata.configNumber.assign(4097, '7');
  EXPECT_EQ(reader.read(asBytes(kSampleLog), &metadata).error().message,
            "its metadata: the configuration number has more than 4096 bytes");
  metadata.osVersion = "\xFF";
  EXPECT_EQ(reader.read(asBytes(kSampleLog), &metadata).error().message,
            "its metadata: the OS version is not UTF-8");
  EXPECT_EQ(readMetadataFile(asBytes("<plist><dict><key>LogType</key><string>" +
                                     std::string(4097, '7') + "</string></dict></plist>"))
                .error()
                .message,
            "the log type has more than 4096 bytes");
}

TEST(LogReaderTest, TellsLogsApartByAllThatTheySay) {
  LogReader reader;
  const auto digest = reader.read(asBytes(kSampleLog), nullptr)->digest;
  const std::pair<const char*, const char*> changes[] = {{"12000", "12001"},
                                                         {"app.starts", "app.start"},
                                                         {"44257.1875", "44257"},
                                                         {"04:05Z", "04:06Z"},
                                                         {"11-24T", "11-23T"},
                                                         {"de-AT", "de"},
                                                         {"<string>AT", "<string>"},
                                                         {"(no tasking id)", "t-7"},
                                                         {"eb42", "eb43"},
                                                         {">1.2<", ">1.3<"},
                                                         {"-7", "-8"},
                                                         {"(2.5, 100]", "(2.5, 99]"}};
  for (const auto& [old, replacement] : changes) {
    const auto record = reader.read(asBytes(changed(kSampleLog, old, replacement)), nullptr);
    ASSERT_TRUE(record) << record.error().message;
    EXPECT_NE(record->digest, digest) << replacement;
  }
}

TEST(LogReaderTest, TakesWhatADeviceMakesOfExtremes) {
  const std::string log = changed(changed(kSampleLog, ">1</real>", ">-1e308</real>"),  //
                                  ">250</real>", ">1e308</real>");
  EXPECT_EQ(faultIn(changed(changed(log, "67.875", "-inf"), "44257.1875", "-inf")), "none");
  EXPECT_EQ(faultIn(changed(kSampleLog, "(100, inf)", "(100, inf]")), "none");
}

TEST(LogReaderTest, NamesWhatIsWrong) {
  const char* const four = "<integer>4</integer>";
  const std::string delay = "BHDistributions/app.delay: ";
  const std::string histogram = "BHDistributionsHistogram/app.delay";
  const std::tuple<const char*, const char*, std::string> cases[] = {
      {"BHCrashLogVersion", "BHOther", "is not a tallied log: it has no BHCrashLogVersion"},
      {"BHScalars", "BHOther", "is not a tallied log: it has no BHScalars"},
      {"<integer>1</integer>", "<integer>2</integer>",
       "BHCrashLogVersion: is a version that this program does not know"},
      {"BHTasking", "BHScalars", "BHScalars: occurs twice"},
      {"BHTasking</key>\n\t<array/>", "BHMetadata</key>\n\t<array/>", "BHMetadata: occurs twice"},
      {"<integer>12000</integer>", "<real>12000</real>", "BHScalars/app.starts: is not an integer"},
      {"12000", "9223372036854775808", "BHScalars/app.starts: exceeds 64 bits with a sign"},
      {"12000", "12x", "BHScalars/app.starts: \"12x\" is not a 64-bit integer"},
      {"app.starts", "app.a&lt;b&amp;c", "BHScalars/app.a<b&c: occurs twice"},
      {"<key>app.load</key>", "<key>app.delay</key>", delay + "occurs twice"},
      {"<real>1</real>", "", delay + "is not an array of five numbers"},
      {four, "<real>4</real>", delay + "is not a summary whose count is an integer"},
      {four, "<integer>4</integer><integer>4</integer>", delay + "is not an array of five numbers"},
      {four, "<integer>-4</integer>", delay + "its count is negative"},
      {four, "<integer>2147483648</integer>", delay + "its count exceeds 31 bits"},
      {four, "<integer>0</integer>", delay + "its count is 0, and the other numbers are not"},
      {four, "<integer>1</integer>",
       delay + "its count is 1, and its numbers are not those of one value"},
      {four, "<integer>5</integer>", histogram + ": counts fewer values than its distribution has"},
      {"<key>(2.5, 100]</key>\n\t\t\t<integer>2", "<key>(2.5, 100]</key>\n\t\t\t<integer>3",
       histogram + ": counts more values than its distribution has"},
      {"<real>1</real>", "<real>nan</real>",
       delay + "only one of its minimum and maximum is not a number"},
      {"<real>250</real>", "<real>0.5</real>", delay + "its minimum is above its maximum"},
      {"67.875", "250.5", delay + "its mean is not between minimum and maximum"},
      {"67.875", "inf", delay + "its mean is infinite, and its values are not"},
      {"67.875", "nan", delay + "its mean is not a number, but its deviations are"},
      {"44257.1875", "-1", delay + "its deviations are negative"},
      {"44257.1875", "4e5", delay + "its deviations are larger than its range allows"},
      {"44257.1875", "nan", delay + "its deviations are not a number, but its mean is"},
      {"44257.1875", "1e999", delay + "\"1e999\" is not a number in the range of a double"},
      {"<dict>\n\t\t<key>app.delay</key>\n\t\t<dict>",
       "<dict>\n\t\t<key>app.none</key>\n\t\t<dict>",
       "BHDistributionsHistogram/app.none: has no distribution"},
      {"(2.5, 100]", "2.5-100", histogram + "/2.5-100: the label is not an interval"},
      {"(2.5, 100]", "(100, 2.5]", histogram + "/(100, 2.5]: the label is not an interval"},
      {"(2.5, 100]", "(2.5, nan]", histogram + "/(2.5, nan]: the label is not an interval"},
      {"(2.5, 100]", "(2.5, 100)", histogram + "/(2.5, 100): the label is not an interval"},
      {"(2.5, 100]", "(2, 100]", histogram + ": has buckets that overlap"},
      {"(2.5, 100]", "(100, inf)", histogram + ": has a bucket twice"},
      {"<key>BHUserSetRegionFormat</key>\n\t\t<string>AT</string>", "<key>x</key>",
       "BHMetadata/x: the last key of a dictionary has no value"},
      {"<date>2026-11-25T03:04:05Z</date>", "<true/>", "BHLogCreationDate: is not a date"},
      {"<array/>", "<real>1</real>x", "line 77, column 16: text is outside a value"},
      {"2026-11-24T00:00:00Z", "2026-11-24T00:00:01Z",
       "BHStartDate: is not the beginning of a day"},
      {"2026-11-24T", "1970-01-01T", "BHStartDate: is not within the years 2000 to 2099"},
      {"2026-11-25T", "2100-01-01T", "BHLogCreationDate: is not within the years 2000 to 2099"},
      {"2026-11-25T", "2026-11-23T", "BHLogCreationDate: is before the day that the log reports"},
      {"2026-11-25T03:04:05Z", "yesterday",
       "BHLogCreationDate: \"yesterday\" is not a date of the form YYYY-MM-DDTHH:MM:SSZ"},
      {"UTF-8", "ISO-8859-1", "is in the encoding \"ISO-8859-1\": only UTF-8 is read"},
      {"<plist version=\"1.0\">", "<!DOCTYPE plist [<!ENTITY a \"b\">]><plist>",
       "declares an entity"},
      {"<plist version=\"1.0\">", "<svg>",
       "is not a property list: it begins with another element"},
      {"<array/>", "<set/>", "line 77, column 2: an element is not one of property lists"},
      {"<array/>", "<key>a</key>", "BHTasking: a key has no value"},
      {"<key>BHTasking</key>", "", "a dictionary has a value without a key"},
      {"</plist>", "<dict/></plist>", "there is a second value"},
  };
  for (const auto& [old, replacement, fault] : cases) {
    const std::string found = faultIn(changed(kSampleLog, old, replacement));
    EXPECT_EQ(found, fault);
  }
}

TEST(LogReaderTest, TakesWhatValuesCanGive) {
  const char* const numbers[][4] = {
      {"7", "7", "7", "0"},                 // all alike
      {"1", "250", "nan", "nan"},           // one was not a number
      {"1", "inf", "inf", "nan"},           // one was infinite
      {"-inf", "inf", "nan", "nan"},        // two were
      {"-1e308", "1.7e308", "inf", "inf"},  // their difference is infinite
      {"1e200", "3e200", "2e200", "inf"},   // the square of their difference is
      {"nan", "nan", "nan", "nan"},         // the first was not a number
  };
  for (const auto& [minimum, maximum, mean, deviations] : numbers) {
    std::string log = changed(kSampleLog, ">1</real>", std::string(">") + minimum + "</real>");
    log = changed(log, ">250<", std::string(">") + maximum + "<");
    log = changed(log, ">67.875<", std::string(">") + mean + "<");
    EXPECT_EQ(faultIn(changed(log, ">44257.1875<", std::string(">") + deviations + "<")), "none");
  }
}

TEST(LogReaderTest, TakesATaskIDOfAnyType) {
  for (const char* const value : {"<date>2026-11-24T00:00:00Z</date>", "<real>1</real>", "<true/>",
                                  "<integer>1</integer>", "<array><true/></array>", "<dict/>"}) {
    const std::string log = changed(kSampleLog, "<string>(no tasking id)</string>", value);
    EXPECT_EQ(faultIn(log), "none") << value;
  }
}

TEST(LogReaderTest, RefusesWhatIsNoWholeDocument) {
  EXPECT_EQ(faultIn(""), "is empty");
  EXPECT_EQ(faultIn("{\"BHScalars\": {}}"), "is not a property list");
  EXPECT_EQ(faultIn("bplist00"),
            plist::readBinary(asBytes(std::string_view("bplist00"))).error().message);
  EXPECT_EQ(faultIn(std::string("<\0?\0", 4)), "is in the encoding \"UTF-16\": only UTF-8 is read");
  // Cut to each possible length.
  for (std::size_t size = 1; size < kSampleLog.find("</plist>") + 8; ++size) {
    const std::string found = faultIn(kSampleLog.substr(0, size));
    EXPECT_EQ(found, "is cut short: the property list does not end within its " +
                         std::to_string(size) + " bytes");
  }
  const std::string packed = gzipped(kSampleLog);
  EXPECT_EQ(faultIn(packed.substr(0, packed.size() - 1)),
            "is cut short: the end of its gzip data is missing");
  EXPECT_EQ(faultIn(packed.substr(0, 40) + "#" + packed.substr(41)).substr(0, 30),
            "is damaged: its gzip data has ");
}

TEST(LogReaderTest, BoundsWhatALogMayCost) {
  LogReader reader;
  const std::string bomb = gzipped(std::string(limits::kLogBytes + 1, ' '));
  EXPECT_EQ(reader.read(asBytes(bomb), nullptr).error().message,
            "expands to more than 67108864 bytes");
  EXPECT_EQ(reader.documentBytes(), bomb.size()) << "what a refused log keeps";
  std::string keys;
  for (std::size_t i = 0; i < limits::kLogRows; ++i)
    keys += "<key>k" + std::to_string(i) + "</key><integer>1</integer>";
  EXPECT_EQ(faultIn(changed(kSampleLog, "<key>app.starts", keys + "<key>app.s")),
            "BHScalars/k99993: the log has more than 100000 rows");
  EXPECT_EQ(faultIn(changed(kSampleLog, "app.starts", std::string(5000, 'x'))),
            "BHScalars/app.a<b&c: a key has more than 4096 bytes");
  std::string deep;
  for (int i = 0; i < 200; ++i)
    deep += "<array>";
  EXPECT_EQ(faultIn(changed(kSampleLog, "<array/>", deep)),
            "BHTasking: containers nest deeper than 128");
}

}  // namespace
}  // namespace tavrel::fleet
