// Shared by the two encoders: checks that refuse values, and the order of keys.
#pragma once

#include <cstddef>
#include <deque>
#include <string>
#include <string_view>
#include <vector>

#include "base/expected.h"
#include "base/plist.h"
#include "platform/plist/encodable_text.h"

namespace tavrel::plist {

/// Admits the values of one document, and remembers the reason for a refusal. Operations return
/// false on failure, so that a walk can pass the result on.
class EncodingGuard {
 public:
  explicit EncodingGuard(std::size_t largestCount) : largestCount_(largestCount) {}

  /// `depth` is the number of containers around the value.
  bool admit(const Value& value, std::size_t depth);
  bool admitBytes(std::size_t documentBytes);

  /// Refuses the current value; always returns false.
  bool fail(std::string reason);

  /// Notes, on the way back from a failure, through which key or index the value was reached.
  bool under(std::string_view step);
  bool under(std::size_t index) { return under(std::to_string(index)); }

  Error error() const;

 private:
  const std::size_t largestCount_;
  std::size_t values_ = 0;
  std::string reason_;
  std::string path_;
  bool hasPath_ = false;
};

/// The entries of dictionaries, sorted by key, with keys limited to the alphabet. A stack, because
/// dictionaries nest: entries stay until they are popped. Entries borrow from the dictionary.
class SortedEntries {
 public:
  struct Item {
    std::string_view key;
    const Value* value;
  };

  explicit SortedEntries(Alphabet alphabet) : alphabet_(alphabet) {}

  /// Pushes the entries and returns the index of the first.
  std::size_t push(const Dictionary& dictionary);
  void popTo(std::size_t first) { items_.resize(first); }

  std::size_t end() const { return items_.size(); }
  const Item& operator[](std::size_t index) const { return items_[index]; }

 private:
  void repairKeys(std::size_t first);

  Alphabet alphabet_;
  std::vector<Item> items_;
  std::deque<std::string> repaired_;  // keys that differ from the dictionary's
};

}  // namespace tavrel::plist
