#include "platform/linux/locale/language_tables.h"

namespace tavrel::language_tables {
namespace {

struct CodeRow {
  std::string_view withdrawn;
  std::string_view current;
};
constexpr CodeRow kCodes[] = {
    {"in", "id"}, {"iw", "he"}, {"ji", "yi"}, {"no", "nb"}, {"mo", "ro"},
};

struct ModifierRow {
  std::string_view modifier;
  std::string_view script;
};
constexpr ModifierRow kModifiers[] = {
    {"arabic", "Arab"},  {"cyrillic", "Cyrl"}, {"devanagari", "Deva"},
    {"iqtelif", "Latn"}, {"latin", "Latn"},
};

// A row is a language in a region, or in every other region, and the script used there.
struct ScriptRow {
  std::string_view language;
  std::string_view region;
  std::string_view script;
};
constexpr ScriptRow kRegionalScripts[] = {
    {"az", "IR", "Arab"},  {"kk", "CN", "Arab"}, {"ku", "IQ", "Arab"}, {"mn", "CN", "Mong"},
    {"pa", "PK", "Arab"},  {"sd", "IN", "Deva"}, {"sr", "ME", "Latn"}, {"uz", "AF", "Arab"},
    {"yue", "CN", "Hans"}, {"zh", "HK", "Hant"}, {"zh", "MO", "Hant"}, {"zh", "TW", "Hant"},
    {"zh", "AU", "Hant"},  {"zh", "GB", "Hant"}, {"zh", "US", "Hant"},
};

// A row is a script and the languages usually written in it.
struct LanguagesRow {
  std::string_view script;
  std::string_view languages;
};
constexpr LanguagesRow kUsualScripts[] = {
    {"Arab", "ar ckb fa ks ps sd ug ur"},
    {"Armn", "hy"},
    {"Beng", "as bn mni"},
    {"Cyrl", "ab be bg ce cv kk ky mhr mk mn os ru sah sr tg tt uk"},
    {"Deva", "anp bhb bho brx doi gom hi hne kok mai mr ne raj sa"},
    {"Ethi", "am byn gez sid ti tig wal"},
    {"Geor", "ka"},
    {"Grek", "el"},
    {"Gujr", "gu"},
    {"Guru", "pa"},
    {"Hans", "cmn zh"},
    {"Hant", "hak lzh nan yue"},
    {"Hebr", "he yi"},
    {"Jpan", "ja"},
    {"Khmr", "km"},
    {"Knda", "kn"},
    {"Kore", "ko"},
    {"Laoo", "lo"},
    {"Mlym", "ml"},
    {"Mymr", "my mnw shn"},
    {"Olck", "sat"},
    {"Orya", "or"},
    {"Sinh", "si"},
    {"Taml", "ta"},
    {"Telu", "te"},
    {"Thaa", "dv"},
    {"Thai", "th"},
    {"Tibt", "bo dz"},
};

// Languages whose home region is not their own code in capitals.
struct HomeRow {
  std::string_view language;
  std::string_view region;
};
constexpr HomeRow kHomes[] = {
    {"ar", "EG"}, {"be", "BY"}, {"bn", "BD"},  {"ca", "ES"}, {"cs", "CZ"}, {"cy", "GB"},
    {"da", "DK"}, {"el", "GR"}, {"en", "US"},  {"et", "EE"}, {"eu", "ES"}, {"fa", "IR"},
    {"ga", "IE"}, {"gl", "ES"}, {"he", "IL"},  {"hi", "IN"}, {"ja", "JP"}, {"ka", "GE"},
    {"kk", "KZ"}, {"ko", "KR"}, {"ms", "MY"},  {"nb", "NO"}, {"nn", "NO"}, {"pt", "BR"},
    {"sl", "SI"}, {"sq", "AL"}, {"sr", "RS"},  {"sv", "SE"}, {"ta", "IN"}, {"uk", "UA"},
    {"ur", "PK"}, {"vi", "VN"}, {"yue", "HK"},
};

constexpr std::string_view kLatinAmerica =
    "AR BO BR BZ CL CO CR CU DO EC GT HN MX NI PA PE PR PY SV US UY VE";
constexpr std::string_view kPortugueseAsInPortugal = "AO CH CV GQ GW LU MO MZ ST TL";
constexpr std::string_view kEnglishAsInAmerica = "AS GU MH MP PH PR UM US VI";

/// Whether one of the words of `list` is `word`.
constexpr bool hasWord(std::string_view list, std::string_view word) {
  while (!word.empty() && !list.empty()) {
    const std::size_t end = list.find(' ');
    if (list.substr(0, end) == word) return true;
    if (end == std::string_view::npos) break;
    list.remove_prefix(end + 1);
  }
  return false;
}

}  // namespace

std::string_view currentCode(std::string_view language) {
  for (const CodeRow& row : kCodes) {
    if (row.withdrawn == language) return row.current;
  }
  return language;
}

std::string_view scriptOfModifier(std::string_view modifier) {
  for (const ModifierRow& row : kModifiers) {
    if (row.modifier == modifier) return row.script;
  }
  return {};
}

std::string_view usualScript(std::string_view language, std::string_view region) {
  for (const ScriptRow& row : kRegionalScripts) {
    if (row.language == language && row.region == region) return row.script;
  }
  for (const LanguagesRow& row : kUsualScripts) {
    if (hasWord(row.languages, language)) return row.script;
  }
  return "Latn";
}

std::string homeRegion(std::string_view language, std::string_view script) {
  if (language == "zh") return script == "Hant" ? "TW" : "CN";
  for (const HomeRow& row : kHomes) {
    if (row.language == language) return std::string(row.region);
  }
  std::string region(language);
  for (char& c : region) {
    c = static_cast<char>(c - 'a' + 'A');
  }
  return region;
}

std::array<std::string_view, 2> parentRegions(std::string_view language, std::string_view script,
                                              std::string_view region) {
  if (region.empty()) return {};
  if (language == "es" && hasWord(kLatinAmerica, region)) return {"419", "MX"};
  if (language == "pt" && hasWord(kPortugueseAsInPortugal, region)) return {"PT", ""};
  if (language == "en" && !hasWord(kEnglishAsInAmerica, region)) return {"001", "GB"};
  if (language == "zh" && script == "Hant" && region == "MO") return {"HK", ""};
  return {};
}

}  // namespace tavrel::language_tables
