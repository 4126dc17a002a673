// The languages and the region of a Linux device, from its locale configuration.
//
// The variables are those of /etc/locale.conf under the device root, or, when that is missing, of
// /etc/default/locale: assignments as a shell reads them (NAME=VALUE, NAME="VALUE").
//
// - Preferred languages: the first of LC_ALL, LC_MESSAGES and LANG that is set names the language
//   of messages; "C" and "POSIX" stand for none. As in gettext, the list in LANGUAGE precedes it.
// - Country: the territory of the first of LC_ALL, LC_MEASUREMENT and LANG that is set.
// - System languages: the lines of /etc/tavrel/languages if the file exists, the language of
//   untranslated texts first. Otherwise "en" and the generated locales: the lines of
//   /etc/locale.gen and the folders in /usr/lib/locale. Without any, "en" and the preferred
//   languages.
#pragma once

#include <functional>
#include <map>
#include <set>

#include "platform/linux/files/device_root.h"
#include "platform/locale.h"
#include "platform/system_log.h"

namespace tavrel {

class LinuxLocale final : public Locale {
 public:
  LinuxLocale(const DeviceRoot& root, SystemLog& log) : root_(root), log_(log) {}

  std::vector<std::string> preferredLanguages() override;
  std::vector<std::string> systemLanguages() override;
  /// See `matchLanguages`.
  std::vector<std::string> matchLocalizations(const std::vector<std::string>& available,
                                              const std::vector<std::string>& preferred) override;
  std::optional<std::string> countryCode() override;

 private:
  using Variables = std::map<std::string, std::string, std::less<>>;
  Variables readVariables();

  /// Calls `use` with each significant line. False when the file is missing.
  bool readLines(std::string_view path, const std::function<void(std::string_view line)>& use);
  /// Logs once that a path exists but cannot be used.
  void noteFailure(std::string_view what, const std::string& path, int code);

  const DeviceRoot& root_;
  SystemLog& log_;
  std::set<std::string> told_;
};

}  // namespace tavrel
