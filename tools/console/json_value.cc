#include "tools/console/json_value.h"

#include <algorithm>
#include <cmath>
#include <nlohmann/json.hpp>
#include <vector>

#include "base/base64.h"
#include "base/format.h"
#include "base/iso_date.h"
#include "base/limits.h"
#include "base/text.h"
#include "tools/console/sorted_entries.h"

namespace tavrel {
namespace {

using plist::Kind;
using Json = nlohmann::ordered_json;

constexpr std::string_view kDataMember = "$data";
constexpr std::string_view kDateMember = "$date";
constexpr std::string_view kRealMember = "$real";

Json special(std::string_view member, std::string text) {
  return {{std::string(member), std::move(text)}};
}

// Appends a member to the object. Searching for an earlier one of the same name would take
// quadratic time for large dictionaries, which have no duplicates anyway.
void appendMember(Json& object, std::string key, Json value) {
  object.get_ref<Json::object_t&>().emplace_back(std::move(key), std::move(value));
}

Json jsonOfDictionary(const plist::Dictionary& dictionary) {
  Json object = Json::object();
  for (const plist::Entry* entry : sortedEntries(dictionary)) {
    std::string key(entry->key.view());
    if (key.starts_with('$')) key.insert(0, 1, '$');
    appendMember(object, std::move(key), jsonOf(entry->value));
  }
  return object;
}

Json jsonOfNumber(const plist::Number& number) {
  if (number.isFloating()) {
    if (std::isfinite(number.real())) return number.real();
    return special(kRealMember, numberText(number));
  }
  if (number.kind() == plist::NumberKind::UInt64) return static_cast<std::uint64_t>(number.int64());
  return number.int64();
}

Expected<plist::Value> valueOfSpecial(std::string_view member, std::string_view text) {
  if (member == kDataMember) {
    std::vector<std::byte> bytes;
    if (!readBase64(text, bytes)) return Error{"\"$data\" is not base64"};
    return plist::Value(plist::Data(bytes));
  }
  if (member == kDateMember) {
    const auto date = parseIsoDate(text);
    if (!date) return date.error();
    return plist::Value(*date);
  }
  for (const double value : {HUGE_VAL, -HUGE_VAL, std::nan("")}) {
    if (text == numberText(value)) return plist::Value(value);
  }
  return Error{"\"$real\" is not one of \"nan\", \"inf\", \"-inf\""};
}

bool isSpecial(std::string_view key) {
  return key == kDataMember || key == kDateMember || key == kRealMember;
}

/// "line 2, column 4"; the line is left out when there is only one.
std::string placeText(std::string_view text, std::size_t position) {
  // The byte at fault counts, too: a line end there belongs to its line.
  const std::string_view before = text.substr(0, position - std::min<std::size_t>(position, 1));
  const std::size_t lineEnd = before.rfind('\n');
  std::size_t column = lineEnd == std::string_view::npos ? position : position - lineEnd - 1;
  constexpr std::string_view kMark = "\xEF\xBB\xBF";
  if (lineEnd == std::string_view::npos && text.starts_with(kMark)) column -= kMark.size();
  if (text.find('\n') == std::string_view::npos) return format("column %zu", column);
  return format("line %td, column %zu", 1 + std::ranges::count(before, '\n'), column);
}

/// "not JSON at line 2, column 4: invalid literal", from "[TAG] parse error at line 2, column 4:
/// syntax error while parsing value - invalid literal; last read: 'no'". Other messages lose their
/// tag: "JSON at line 2, column 4: number overflow parsing '1e999'".
std::string inOurWords(std::string_view words, const std::string& place) {
  const std::size_t tag = words.find("] ");
  if (tag != std::string_view::npos) words.remove_prefix(tag + 2);
  constexpr std::string_view kAt = "parse error at ";
  constexpr std::string_view kDash = " - ";
  const std::size_t dash = words.find(kDash);
  if (!words.starts_with(kAt) || dash == std::string_view::npos) {
    return format("JSON at %s: %s", place, words);
  }
  const std::string_view reason = words.substr(dash + kDash.size());
  return format("not JSON at %s: %s", place, reason.substr(0, reason.find(';')));
}

/// Builds values directly from the parser's events, so that numbers keep every digit and a document
/// that nests too deeply is refused before anything recurses over it.
class ValueBuilder final : public nlohmann::json_sax<nlohmann::json> {
 public:
  explicit ValueBuilder(std::string_view text) : text_(text) {}

  plist::Value takeResult() { return std::move(result_); }
  const std::string& message() const { return message_; }

  bool null() override { return fail("a property list cannot contain null"); }
  bool boolean(bool value) override { return add(value); }
  bool number_integer(number_integer_t value) override { return add(value); }
  bool number_unsigned(number_unsigned_t value) override {
    if (value <= std::uint64_t{INT64_MAX}) return add(static_cast<std::int64_t>(value));
    return add(value);
  }
  bool number_float(number_float_t value, const string_t& text) override {
    if (text.find_first_of(".eE") == string_t::npos) {
      return fail(format("the integer %s does not fit 64 bits", text));
    }
    return add(value);
  }
  bool string(string_t& value) override { return add(std::string_view(value)); }
  bool binary(binary_t&) override { return fail("unexpected bytes"); }

  // The object of a special form stands for a value that is no container, so it is no level.
  bool start_object(std::size_t) override {
    return open(plist::Dictionary::create(), limits::kPropertyListDepth + 1);
  }
  bool key(string_t& value) override {
    if (isBelowDeepest() && !isSpecial(value)) return failAtDepth();
    levels_.back().key = value;
    return true;
  }
  bool end_object() override {
    const plist::Dictionary object = levels_.back().container.dictionary();
    plist::Value value = object;
    if (levels_.back().isSpecial) {
      const plist::Entry& only = *object.begin();
      const auto text = only.value.string();
      if (levels_.back().members != 1 || !text) {
        return fail(format("\"%s\" must be the only member of its object, and a string", only.key));
      }
      auto meant = valueOfSpecial(only.key, *text);
      if (!meant) return fail(meant.error().message);
      value = *std::move(meant);
      --count_;
    } else if (isBelowDeepest()) {
      return failAtDepth();
    }
    levels_.pop_back();
    return add(std::move(value));
  }
  bool start_array(std::size_t) override {
    return open(plist::Array::create(), limits::kPropertyListDepth);
  }
  bool end_array() override {
    plist::Value value = std::move(levels_.back().container);
    levels_.pop_back();
    return add(std::move(value));
  }

  bool parse_error(std::size_t position, const std::string&,
                   const nlohmann::detail::exception& e) override {
    message_ = inOurWords(e.what(), placeText(text_, position));
    return false;
  }

 private:
  struct Level {
    plist::Value container;
    std::string key;          // of the next member
    std::size_t members = 0;  // or elements
    bool isSpecial = false;   // a member with one of the special names was seen
  };

  bool isBelowDeepest() const { return levels_.size() > limits::kPropertyListDepth; }

  // A path of so many levels would be cut off before the reason.
  bool failAtDepth() {
    levels_.clear();
    return fail("nested too deeply");
  }

  bool open(plist::Value container, std::size_t mostLevels) {
    if (levels_.size() == mostLevels) return failAtDepth();
    levels_.push_back({std::move(container), {}});
    return true;
  }

  bool add(plist::Value value) {
    if (++count_ > limits::kPropertyListValues) return fail("too many values");
    if (levels_.empty()) {
      result_ = std::move(value);
      return true;
    }
    Level& level = levels_.back();
    ++level.members;
    if (auto array = level.container.array()) {
      array.append(std::move(value));
      return true;
    }
    auto object = level.container.dictionary();
    std::string_view key = level.key;
    if (isSpecial(key)) {
      level.isSpecial = true;
    } else if (key.starts_with("$$")) {
      key.remove_prefix(1);
    } else if (key.starts_with('$')) {
      return fail(format("\"%s\" is not a known form: write a key that begins with $ as $$", key));
    }
    object.set(key, std::move(value));
    return true;
  }

  bool fail(std::string_view what) {
    message_ = "JSON";
    for (const Level& level : levels_) {
      if (level.container.array()) {
        appendFormat(message_, "/%zu", level.members);
      } else if (!level.key.empty()) {
        appendFormat(message_, "/%s", level.key);
      }
    }
    appendFormat(message_, ": %s", what);
    return false;
  }

  std::vector<Level> levels_;
  plist::Value result_;
  const std::string_view text_;
  std::string message_;
  std::size_t count_ = 0;
};

// Numbers, texts and keys in messages may be as long as the document.
std::string shortened(std::string message) {
  constexpr std::size_t kLongest = 300;
  if (message.size() <= kLongest) return message;
  std::size_t length = kLongest;
  while ((message[length] & 0xC0) == 0x80)
    --length;
  message.resize(length);
  return message + "...";
}

}  // namespace

Json jsonOf(const plist::Value& value) {
  switch (value.kind()) {
    case Kind::Null:
      return nullptr;
    case Kind::Boolean:
      return *value.boolean();
    case Kind::Number:
      return jsonOfNumber(*value.number());
    case Kind::Date:
      return special(kDateMember, isoDateText(*value.date()));
    case Kind::String:
      return std::string(*value.string());
    case Kind::Data: {
      std::string text;
      appendBase64(text, value.data().bytes());
      return special(kDataMember, std::move(text));
    }
    case Kind::Array: {
      Json array = Json::array();
      for (const plist::Value& element : value.array())
        array.push_back(jsonOf(element));
      return array;
    }
    case Kind::Dictionary:
      return jsonOfDictionary(value.dictionary());
  }
  return nullptr;
}

Expected<plist::Value> parseJsonValue(std::string_view text) {
  ValueBuilder builder(text);
  if (!nlohmann::json::sax_parse(text.begin(), text.end(), &builder)) {
    return Error{shortened(builder.message())};
  }
  return builder.takeResult();
}

}  // namespace tavrel
