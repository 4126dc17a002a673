#include "platform/locale.h"

#include "platform/linux/locale/language_matching.h"
#include "platform/linux/locale/language_tag.h"
#include "platform/linux/locale/linux_locale.h"
#include "tests/devices/device_services.h"

namespace tavrel {
namespace {

using Names = std::vector<std::string>;

TEST(LanguageTag, ReadsTagsAndNamesOfLocales) {
  struct Case {
    const char* name;
    const char* tag;  // empty: no language
    const char* script = "Latn";
  };
  const Case cases[] = {{"de_AT.UTF-8@euro", "de-AT"},
                        {"sr_RS@latin", "sr-Latn-RS"},
                        {"zh_TW.Big5", "zh-TW", "Hant"},
                        {"zh-hant-hk", "zh-Hant-HK", "Hant"},
                        {"tt_RU@iqtelif", "tt-Latn-RU"},
                        {"ca_ES@valencia", "ca-ES-valencia"},
                        {"de-CH-1996-u-co-phonebk", "de-CH-1996"},
                        {"iw_IL", "he-IL", "Hebr"},
                        {"no_NO", "nb-NO"},
                        {"C", ""},
                        {"german", ""},
                        {"de_", "de"},
                        {"de_\xff\xff", ""},
                        {"../../etc", ""}};
  for (const Case& row : cases) {
    const auto tag = parseLanguageTag(row.name);
    EXPECT_EQ(tag ? tag->text() : "", row.tag) << row.name;
    EXPECT_TRUE(!tag || tag->effectiveScript() == row.script) << row.name;
  }
}

TEST(LanguageMatching, PrefersRegionThenParentThenLanguageAndNeverCrossesScripts) {
  const std::tuple<Names, Names, Names> cases[] = {
      {{"en", "de", "de-AT"}, {"de-AT"}, {"de-AT", "de"}},
      {{"en", "de-CH", "de-DE", "de"}, {"de-AT"}, {"de", "de-DE", "de-CH"}},
      {{"fr-CA", "fr-FR"}, {"fr"}, {"fr-FR", "fr-CA"}},
      {{"pt", "pt-BR", "pt-PT"}, {"pt-AO"}, {"pt-PT", "pt", "pt-BR"}},
      {{"es", "es-ES", "es-419"}, {"es-MX"}, {"es-419", "es", "es-ES"}},
      {{"en", "en-US", "en-GB", "en-001"}, {"en-AU"}, {"en-001", "en-GB", "en", "en-US"}},
      {{"zh-Hans", "zh-Hant", "zh-HK"}, {"zh-TW"}, {"zh-Hant", "zh-HK"}},
      {{"zh-Hant-TW", "zh-Hant-HK", "zh_CN"}, {"zh_MO"}, {"zh-Hant-HK", "zh-Hant-TW"}},
      {{"sr_RS@latin", "sr"}, {"sr-ME"}, {"sr_RS@latin"}},
      {{"en", "sr-Latn"}, {"sr"}, {"en"}},
      {{"ca-ES-valencia", "ca", "ca-FR"}, {"ca-ES"}, {"ca", "ca-FR", "ca-ES-valencia"}},
      {{"en", "no", "da"}, {"nb-NO", "da-DK", "nb"}, {"no", "da"}},
      {{"de", "de", "C", "?"}, {"?", "de", "de"}, {"de"}},
      {{"xx-1", "en"}, {"ja"}, {"xx-1"}}};
  for (const auto& [available, preferred, matches] : cases) {
    EXPECT_EQ(matchLanguages(available, preferred), matches)
        << testing::PrintToString(available) << " for " << testing::PrintToString(preferred);
  }
  Names many(limits::kLanguages, "?");
  many.push_back("de");
  EXPECT_EQ(matchLanguages({"en", "de"}, many), Names{"en"});
}

struct LocaleTest : testing::Test, DeviceServices {
  LinuxLocale locale{root, log};
};

TEST_F(LocaleTest, TakesPreferencesAndCountryFromTheConfiguration) {
  // The last column is the country, empty for none.
  const std::tuple<const char*, Names, const char*> cases[] = {
      {"# LANG=fr\n export LANG=\"de_AT.UTF-8\"  # x\nLANGUAGE='de:fr:de'\n",
       {"de", "fr", "de-AT"},
       "AT"},
      {"LANG=en_US\nLC_ALL=it_IT\nLC_MESSAGES=fr_CA\nLC_MEASUREMENT=de_CH\n", {"it-IT"}, "IT"},
      {"LANG=C.UTF-8\nLANGUAGE=de\n", {}, ""},
      {"LANG=en_US\nLANGUAGE=::de:C:fr\n", {"de"}, "US"},
      {"LANG=de_DE\nLC_MEASUREMENT=C\n", {"de-DE"}, ""},
      {"LANG\n=\nLANG=\x01\xff\n", {}, ""}};
  write("/etc/default/locale", "LANG=pl_PL.UTF-8\n");
  EXPECT_EQ(locale.preferredLanguages(), Names{"pl-PL"});
  for (const auto& [file, preferred, country] : cases) {
    write("/etc/locale.conf", file);
    EXPECT_EQ(locale.preferredLanguages(), preferred) << file;
    EXPECT_EQ(locale.countryCode().value_or(""), country) << file;
  }
  EXPECT_EQ(log.lines, Names{});
}

TEST_F(LocaleTest, ListsTheLanguagesOfTheSystem) {
  EXPECT_EQ(locale.systemLanguages(), Names{"en"});
  write("/etc/locale.conf", "LANG=fi_FI\n");
  write("/etc/locale.gen", "# de_DE.UTF-8 UTF-8\nC.UTF-8 UTF-8\n");
  write("/usr/lib/locale/locale-archive", "sv_SE");
  EXPECT_EQ(locale.systemLanguages(), (Names{"en", "fi-FI"}));

  write("/etc/locale.gen", "zh_TW BIG5\n de_DE.UTF-8 UTF-8\nde_DE ISO-8859-1\n");
  write("/usr/lib/locale/fr_FR.utf8/LC_TIME", "");
  EXPECT_EQ(locale.systemLanguages(), (Names{"en", "de-DE", "fr-FR", "zh-TW"}));

  const std::string folder = root.path("/usr/lib/locale");
  std::filesystem::remove_all(folder);
  std::filesystem::create_symlink(folder, folder);
  for (int i = 0; i < 2; ++i)
    EXPECT_EQ(locale.systemLanguages(), (Names{"en", "de-DE", "zh-TW"}));
  EXPECT_EQ(log.lines, Names{"cannot list " + folder + ": Too many levels of symbolic links"});
  log.lines.clear();

  std::filesystem::remove(root.path("/etc/locale.conf"));
  ASSERT_EQ(mkfifo(root.path("/etc/locale.conf").c_str(), 0600), 0);
  EXPECT_EQ(locale.preferredLanguages(), Names{});
  EXPECT_EQ(locale.countryCode(), std::nullopt);
  EXPECT_EQ(log.lines.size(), 1U) << "told once, and never waited for";
  log.lines.clear();

  write("/etc/tavrel/languages", "# screens\nde\n\nzh_TW\nno language\n");
  EXPECT_EQ(locale.systemLanguages(), (Names{"de", "zh-TW"}));
  EXPECT_EQ(log.lines,
            Names{root.path("/etc/tavrel/languages") +
                  ": \"no language\" is not a language; write one tag per line, such as de "
                  "or pt-BR"});
}

}  // namespace
}  // namespace tavrel
