#include "platform/linux/logs/record_file_name.h"

#include <charconv>

#include "base/civil_time.h"

namespace tavrel {
namespace {

constexpr std::string_view kEnding = ".jsonl";

}  // namespace

std::string recordFileName(const RecordFileName& file) {
  std::string name = std::to_string(file.type);
  name += '-';
  name += dateText(civilFromDays(file.day));
  name += kEnding;
  return name;
}

std::optional<RecordFileName> parseRecordFileName(std::string_view name) {
  if (!name.ends_with(kEnding)) return std::nullopt;
  name.remove_suffix(kEnding.size());
  RecordFileName file{};
  const char* const end = name.data() + name.size();
  const auto [dash, fault] = std::from_chars(name.data(), end, file.type);
  if (fault != std::errc{} || dash == end || *dash != '-') return std::nullopt;
  const auto date = parseDate(name.substr(static_cast<std::size_t>(dash - name.data()) + 1));
  if (!date) return std::nullopt;
  file.day = daysFromCivil(*date);
  return file;
}

}  // namespace tavrel
