#include "tools/completion/scripts/completion_script.h"

#include <algorithm>

namespace tavrel {

std::string CompletedProgram::identifier() const {
  std::string result = name();
  std::replace(result.begin(), result.end(), '-', '_');
  return result;
}

const OptionModel& CompletedProgram::anywhereOption() const {
  return *std::ranges::find_if(
      model.options, [&](const OptionModel& option) { return option.name() == anywhere; });
}

std::string_view CompletedProgram::valueKind(const CommandModel& command,
                                             const OptionModel& option) const {
  static constexpr std::pair<std::string_view, std::string_view> kPaths[] = {{"FILE", "files"},
                                                                             {"WHERE", "files"},
                                                                             {"FILE2", "files"},
                                                                             {"PATH", "files"},
                                                                             {"DIR", "folders"}};
  for (const Exception& exception : exceptions) {
    if (command.path.starts_with(exception.path) && option.value == exception.value)
      return exception.list;
  }
  for (const auto& [value, kind] : kPaths)
    if (option.value == value) return kind;
  for (const auto& [value, list] : lists)
    if (option.value == value) return list;
  return "none";
}

std::string filledIn(std::string_view text, const CompletedProgram& program) {
  std::string result(text);
  for (const auto& [mark, value] :
       {std::pair<std::string_view, std::string>("@program@", program.name()),
        {"@id@", program.identifier()},
        {"@anywhere@", program.anywhere}}) {
    for (std::size_t at = 0; (at = result.find(mark, at)) != std::string::npos; at += value.size())
      result.replace(at, mark.size(), value);
  }
  return result;
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
