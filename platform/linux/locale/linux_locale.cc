#include "platform/linux/locale/linux_locale.h"

#include <algorithm>
#include <cerrno>
#include <initializer_list>
#include <string_view>
#include <sys/stat.h>
#include <utility>

#include "base/ascii.h"
#include "base/limits.h"
#include "base/text.h"
#include "platform/linux/files/file_system.h"
#include "platform/linux/files/folder_walk.h"
#include "platform/linux/files/line_reader.h"
#include "platform/linux/files/system_error.h"
#include "platform/linux/locale/language_matching.h"
#include "platform/linux/locale/language_tag.h"

namespace tavrel {
namespace {

constexpr std::string_view kLocaleFiles[] = {"/etc/locale.conf", "/etc/default/locale"};
constexpr std::string_view kLanguagesFile = "/etc/tavrel/languages";
constexpr std::string_view kGeneratedLocalesFile = "/etc/locale.gen";
constexpr std::string_view kGeneratedLocalesFolder = "/usr/lib/locale";

/// The language of untranslated texts.
constexpr std::string_view kUntranslated = "en";

/// The value of an assignment, without quotation marks and trailing text.
std::string_view unquoted(std::string_view value) {
  if (value.starts_with('"') || value.starts_with('\'')) {
    const char mark = value.front();
    value.remove_prefix(1);
    return value.substr(0, value.find(mark));
  }
  return value.substr(0, value.find_first_of(" \t#"));
}

/// Languages in the order in which they are added, each once.
class LanguageList {
 public:
  void add(const std::string& language) {
    if (languages_.size() == limits::kLanguages) return;
    if (std::find(languages_.begin(), languages_.end(), language) == languages_.end()) {
      languages_.push_back(language);
    }
  }
  /// False when `name` does not name a language.
  bool addNamed(std::string_view name) {
    const auto tag = parseLanguageTag(name);
    if (tag) add(tag->text());
    return tag.has_value();
  }
  std::vector<std::string> take() { return std::move(languages_); }

 private:
  std::vector<std::string> languages_;
};

std::string_view firstSet(const std::map<std::string, std::string, std::less<>>& variables,
                          std::initializer_list<std::string_view> names) {
  for (const std::string_view name : names) {
    const auto found = variables.find(name);
    if (found != variables.end() && !found->second.empty()) return found->second;
  }
  return {};
}

}  // namespace

bool LinuxLocale::readLines(std::string_view path,
                            const std::function<void(std::string_view)>& use) {
  const std::string file = root_.path(path);
  LineReader lines(file);
  while (const auto line = lines.next()) {
    const std::string_view text = trimmed(*line);
    if (!text.empty() && !text.starts_with('#')) use(text);
  }
  const int code = lines.errorNumber();
  if (code == ENOENT || code == ENOTDIR) return false;
  noteFailure("read", file, code);
  return true;
}

void LinuxLocale::noteFailure(std::string_view what, const std::string& path, int code) {
  if (code == 0 || code == ENOENT || code == ENOTDIR) return;
  if (told_.insert(path).second) {
    log_.write(LogLevel::Error, systemError(what, path, code).message);
  }
}

LinuxLocale::Variables LinuxLocale::readVariables() {
  static constexpr std::string_view kNames[] = {"LANGUAGE", "LANG", "LC_ALL", "LC_MESSAGES",
                                                "LC_MEASUREMENT"};
  Variables variables;
  for (const std::string_view path : kLocaleFiles) {
    const bool present = readLines(path, [&](std::string_view line) {
      if (line.starts_with("export ")) line = trimmed(line.substr(7));
      const std::size_t equals = line.find('=');
      if (equals == std::string_view::npos) return;
      const std::string_view name = line.substr(0, equals);
      if (std::find(std::begin(kNames), std::end(kNames), name) == std::end(kNames)) return;
      variables[std::string(name)] = unquoted(line.substr(equals + 1));
    });
    if (present) break;
  }
  return variables;
}

std::vector<std::string> LinuxLocale::preferredLanguages() {
  const Variables variables = readVariables();
  const std::string_view messages = firstSet(variables, {"LC_ALL", "LC_MESSAGES", "LANG"});
  if (!parseLanguageTag(messages)) return {};
  LanguageList languages;
  std::string_view list = firstSet(variables, {"LANGUAGE"});
  while (!list.empty()) {
    const std::size_t end = std::min(list.find(':'), list.size());
    const std::string_view name = list.substr(0, end);
    // Languages after "C" never count: untranslated texts exist for everything.
    if (name == "C" || name == "POSIX") return languages.take();
    languages.addNamed(name);
    list.remove_prefix(std::min(end + 1, list.size()));
  }
  languages.addNamed(messages);
  return languages.take();
}

std::vector<std::string> LinuxLocale::systemLanguages() {
  LanguageList listed;
  const bool present = readLines(kLanguagesFile, [&](std::string_view line) {
    if (listed.addNamed(line)) return;
    log_.log(LogLevel::Error,
             "%s: %s is not a language; write one tag per line, such as de or pt-BR",
             root_.path(kLanguagesFile), quotedText(line));
  });
  if (present) return listed.take();

  std::vector<std::string> generated;
  readLines(kGeneratedLocalesFile, [&](std::string_view line) {
    generated.emplace_back(line.substr(0, line.find_first_of(" \t\r")));
  });
  const std::string folder = root_.path(kGeneratedLocalesFolder);
  const int code = walkFolder(folder, [&](const dirent& entry) {
    const auto status = FileSystem::status(folder + '/' + entry.d_name);
    if (status && S_ISDIR(status->st_mode)) generated.emplace_back(entry.d_name);
    return true;
  });
  noteFailure("list", folder, code);
  std::sort(generated.begin(), generated.end());
  LanguageList languages;
  languages.add(std::string(kUntranslated));
  bool any = false;
  for (const std::string& name : generated) {
    any |= languages.addNamed(name);
  }
  if (!any) {
    for (const std::string& language : preferredLanguages()) {
      languages.add(language);
    }
  }
  return languages.take();
}

std::vector<std::string> LinuxLocale::matchLocalizations(
    const std::vector<std::string>& available, const std::vector<std::string>& preferred) {
  return matchLanguages(available, preferred);
}

std::optional<std::string> LinuxLocale::countryCode() {
  const Variables variables = readVariables();
  const auto tag = parseLanguageTag(firstSet(variables, {"LC_ALL", "LC_MEASUREMENT", "LANG"}));
  // Three-digit regions are groups of countries.
  if (!tag || tag->region.size() != 2) return std::nullopt;
  return tag->region;
}

}  // namespace tavrel
