#include "tools/completion/completion_script.h"

#include <utility>

namespace tavrel {

std::string_view valueKind(const CommandModel& command, const OptionModel& option) {
  static constexpr std::pair<std::string_view, std::string_view> kKinds[] = {
      {"FILE", "files"}, {"OUTPUT", "files"}, {"FILE2", "files"}, {"DIR", "folders"},
      {"DAY", "days"},   {"KEY", "keys"},     {"PREFIX", "keys"}, {"DOMAIN", "domains"}};
  // Keys of preferences are not those of statistics.
  if (command.path.starts_with("prefs") && option.value == "KEY") return "none";
  if (command.path == "log show" && option.value == "FILE") return "logs";
  for (const auto& [value, kind] : kKinds)
    if (option.value == value) return kind;
  return "none";
}

std::string shellQuoted(std::string_view text, std::string_view escape) {
  std::string result = "'";
  for (const char character : text) {
    if (character == '\'') {
      result += escape;
    } else {
      result += character;
    }
  }
  return result + "'";
}

std::string joined(const std::vector<std::string>& words) {
  std::string result;
  for (const std::string& word : words) {
    if (!result.empty()) result += ' ';
    result += word;
  }
  return result;
}

}  // namespace tavrel
