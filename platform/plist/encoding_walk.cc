#include "platform/plist/encoding_walk.h"

#include <algorithm>
#include <map>
#include <set>

#include "base/format.h"
#include "base/limits.h"

namespace tavrel::plist {

bool EncodingGuard::admit(const Value& value, std::size_t depth) {
  switch (value.kind()) {
    case Kind::Null:
      return fail("null has no encoding");
    case Kind::Array:
    case Kind::Dictionary:
      if (depth < limits::kPropertyListDepth) break;
      reason_ = format("containers nest deeper than %zu, or one contains itself",
                       limits::kPropertyListDepth);
      return false;
    default:
      break;
  }
  if (++values_ <= largestCount_) return true;
  reason_ = format("it has more than %zu values", largestCount_);
  return false;
}

bool EncodingGuard::admitBytes(std::size_t documentBytes) {
  if (documentBytes <= limits::kPropertyListBytes) return true;
  reason_ = format("the document is longer than %zu bytes", limits::kPropertyListBytes);
  return false;
}

bool EncodingGuard::fail(std::string reason) {
  reason_ = std::move(reason);
  hasPath_ = true;
  return false;
}

bool EncodingGuard::under(std::string_view step) {
  if (hasPath_) path_.insert(0, "/" + excerpt(step));
  return false;
}

Error EncodingGuard::error() const {
  if (!hasPath_) return {"cannot encode the property list: " + reason_};
  return {"cannot encode the property list, value " + (path_.empty() ? "/" : path_) + ": " +
          reason_};
}

std::size_t SortedEntries::push(const Dictionary& dictionary) {
  const std::size_t first = items_.size();
  bool encodableKeys = true;
  for (const Entry& entry : dictionary) {
    items_.push_back({entry.key.view(), &entry.value});
    encodableKeys = encodableKeys && isEncodable(entry.key, alphabet_);
  }
  const auto begin = items_.begin() + static_cast<std::ptrdiff_t>(first);
  // Dictionaries from our own documents are already in order.
  if (!std::ranges::is_sorted(begin, items_.end(), {}, &Item::key)) {
    std::ranges::sort(begin, items_.end(), {}, &Item::key);
  }
  if (!encodableKeys) {
    repairKeys(first);
    std::ranges::sort(begin, items_.end(), {}, &Item::key);
  }
  return first;
}

void SortedEntries::repairKeys(std::size_t first) {
  std::set<std::string_view> taken;
  std::vector<Item*> lacking;
  for (std::size_t i = first; i < items_.size(); ++i) {
    if (isEncodable(items_[i].key, alphabet_)) {
      taken.insert(items_[i].key);
    } else {
      lacking.push_back(&items_[i]);
    }
  }
  // Numbers continue from the last one for the same text, so that many keys that become equal do
  // not each need a full search.
  std::map<std::string, std::size_t> lastNumbers;
  for (Item* item : lacking) {
    const std::string text = encodable(item->key, alphabet_);
    std::size_t& number = lastNumbers[text];
    do {
      ++number;
      repaired_.push_back(number == 1 ? text : text + std::to_string(number));
    } while (!taken.insert(repaired_.back()).second);
    item->key = repaired_.back();
  }
}

}  // namespace tavrel::plist
