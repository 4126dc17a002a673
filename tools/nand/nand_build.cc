#include "tools/nand/nand_build.h"

#include <cstdint>
#include <limits>
#include <optional>
#include <string_view>
#include <unordered_map>

#include "base/ascii.h"
#include "base/format.h"
#include "base/parse_number.h"
#include "storage/parse/statistic_keys.h"
#include "tools/console/value_text.h"

namespace tavrel {
namespace {

constexpr std::uint64_t kLargestWord = std::numeric_limits<std::uint32_t>::max();

void appendLittle(std::string& out, std::uint64_t value, std::size_t bytes) {
  for (std::size_t i = 0; i < bytes; ++i)
    out += static_cast<char>(value >> (8 * i) & 0xFF);
}

std::optional<std::uint64_t> unsignedOf(const plist::Value& value) {
  const auto number = value.number();
  if (!number || number->isFloating()) return std::nullopt;
  if (number->kind() != plist::NumberKind::UInt64 && number->int64() < 0) return std::nullopt;
  return static_cast<std::uint64_t>(number->int64());
}

std::optional<std::uint32_t> wordOf(const plist::Value& value) {
  const auto number = unsignedOf(value);
  if (!number || *number > kLargestWord) return std::nullopt;
  return static_cast<std::uint32_t>(*number);
}

/// An element of a statistic, named as in the arrays that `nand parse` lists.
struct Element {
  const StatisticKey* statistic;
  std::uint32_t index;
};

class Builder {
 public:
  Builder() {
    for (const StatisticKey& statistic : kStatisticKeys)
      byName_.emplace(statistic.name, &statistic);
  }

  Status add(const plist::Value& entry) {
    if (const plist::Array pair = entry.array()) return addPair(pair);
    run_ = {};
    const plist::Dictionary object = entry.dictionary();
    if (object.contains("hex") && object.size() == 1) return addHex(object.get("hex"));
    if (object.contains("key")) return addRecord(object);
    return Error{
        format("%s is not an entry: give [statistic, value], {\"key\": …, \"values\": […]} or "
               "{\"hex\": …}",
               inlineText(entry))};
  }

  std::string take() { return std::move(bytes_); }

 private:
  /// Consecutive elements share a record; this is the record that may be continued.
  struct Run {
    const StatisticKey* statistic = nullptr;
    std::size_t recordAt = 0;  // offset in the bytes
    std::uint32_t count = 0;   // values so far
  };

  std::optional<Element> elementOf(std::string_view name) const {
    const std::size_t stem = name.find_last_not_of("0123456789") + 1;
    const std::string_view digits = name.substr(stem);
    if (digits.empty() || (digits.size() > 1 && digits[0] == '0')) return std::nullopt;
    const auto at = byName_.find(name.substr(0, stem));
    const auto index = parseNumber<std::uint32_t>(digits);
    if (at == byName_.end() || !index) return std::nullopt;
    return Element{at->second, *index};
  }

  Expected<std::uint32_t> keyOf(const plist::Value& statistic) const {
    if (const auto number = wordOf(statistic)) return *number;
    const auto name = statistic.string();
    if (!name) {
      return Error{format("%s is not a statistic: give its name or its 32-bit number",
                          inlineText(statistic))};
    }
    const auto at = byName_.find(*name);
    if (at == byName_.end()) {
      return Error{format("no statistic is named %s: give the number of one that is not known",
                          inlineText(statistic))};
    }
    return at->second->key;
  }

  void addHeader(std::uint32_t key, std::uint64_t count) {
    appendLittle(bytes_, key, 4);
    appendLittle(bytes_, count, 4);
  }

  Status addValue(const plist::Value& value) {
    const auto number = unsignedOf(value);
    if (!number) {
      return Error{
          format("%s is not a value: give an integer from 0 to 2^64 - 1", inlineText(value))};
    }
    appendLittle(bytes_, *number, 8);
    return Done{};
  }

  Status addValues(const plist::Array& values) {
    for (const plist::Value& value : values) {
      if (Status added = addValue(value); !added) return added;
    }
    return Done{};
  }

  Status addPair(const plist::Array& pair) {
    if (pair.size() != 2) {
      return Error{format("%zu members: give a statistic and its value, or a list of its values",
                          pair.size())};
    }
    const plist::Value statistic = pair.at(0), value = pair.at(1);
    const auto name = statistic.string();
    if (name && !byName_.contains(*name)) {
      if (const auto element = elementOf(*name)) return addElement(*element, value);
    }
    run_ = {};
    const auto key = keyOf(statistic);
    if (!key) return key.error();
    const plist::Array values = value.array();
    addHeader(*key, values ? values.size() : 1);
    return values ? addValues(values) : addValue(value);
  }

  Status addElement(const Element& element, const plist::Value& value) {
    const std::uint32_t expected = run_.statistic == element.statistic ? run_.count : 0;
    if (element.index == 0) {
      run_ = {element.statistic, bytes_.size(), 0};
      addHeader(element.statistic->key, 1);
    } else if (element.index != expected) {
      return Error{format(
          "%s%u does not follow %s%u: give the elements from 0 on, one after the "
          "other, or a list",
          element.statistic->name, element.index, element.statistic->name, element.index - 1)};
    }
    ++run_.count;
    for (std::size_t i = 0; i < 4; ++i)
      bytes_[run_.recordAt + 4 + i] = static_cast<char>(run_.count >> (8 * i) & 0xFF);
    return addValue(value);
  }

  Status addRecord(const plist::Dictionary& record) {
    for (const plist::Entry& member : record) {
      const std::string_view name = member.key;
      if (name != "key" && name != "count" && name != "values") {
        return Error{
            format("\"%s\" is not a member of a record: it has key, count and values", name)};
      }
    }
    const auto key = keyOf(record.get("key"));
    if (!key) return key.error();
    const plist::Value list = record.get("values");
    const plist::Array values = list ? list.array() : plist::Array::create();
    if (!values) return Error{format("\"values\": %s is not a list", inlineText(list))};
    const plist::Value said = record.get("count");
    std::uint64_t count = values.size();
    if (said) {
      const auto word = wordOf(said);
      if (!word) {
        return Error{
            format("\"count\": %s is not an integer from 0 to 2^32 - 1", inlineText(said))};
      }
      count = *word;
    }
    addHeader(*key, count);
    return addValues(values);
  }

  Status addHex(const plist::Value& value) {
    const Error error{format("\"hex\": %s: give pairs of hexadecimal digits", inlineText(value))};
    const auto text = value.string();
    if (!text) return error;
    std::optional<unsigned> high;
    for (const char c : *text) {
      if (c == ' ' || c == '\n' || c == '\t') continue;
      const auto digit = hexDigit(c);
      if (!digit) return error;
      if (high) bytes_ += static_cast<char>(*high << 4 | *digit);
      high = high ? std::nullopt : digit;
    }
    if (high) return error;
    return Done{};
  }

  std::unordered_map<std::string_view, const StatisticKey*> byName_;
  std::string bytes_;
  Run run_;
};

// The members that `nand parse --json` prints. Only the entries determine the buffer.
bool isKnownMember(std::string_view name) {
  return name == "entries" || name == "format_version" || name == "result" || name == "fields";
}

}  // namespace

Expected<std::string> buildStatistics(const plist::Value& document) {
  const plist::Dictionary object = document.dictionary();
  const plist::Array entries = object ? object.array("entries") : plist::Array();
  if (!entries) return Error{"no list of entries: give an object with \"entries\": […]"};
  for (const plist::Entry& member : object) {
    if (!isKnownMember(member.key)) {
      return Error{
          format("\"%s\" is not a member of this form: records belong in \"entries\"", member.key)};
    }
  }
  Builder builder;
  for (std::size_t i = 0; i < entries.size(); ++i) {
    if (const Status added = builder.add(entries.at(i)); !added) {
      return Error{format("entries[%zu]: %s", i, added.error().message)};
    }
  }
  return builder.take();
}

}  // namespace tavrel
