// The objects behind the handles of base/plist.h. For the implementation of values only.
#pragma once

#include <cstddef>
#include <cstdint>
#include <vector>

#include "base/plist.h"

namespace tavrel::plist::detail {

/// Followed in memory by `length` bytes of text.
struct StringRep : Shared {
  explicit StringRep(std::size_t textLength) : Shared(Kind::String), length(textLength) {}
  std::size_t length;
  const char* text() const { return reinterpret_cast<const char*>(this + 1); }
};

struct DataRep : Shared {
  DataRep() : Shared(Kind::Data) {}
  std::vector<std::byte> bytes;
};

struct ArrayRep : Shared {
  ArrayRep() : Shared(Kind::Array) {}
  std::vector<Value> values;
};

/// Entries in the order of insertion. A removed entry stays, with a null value, until half of the
/// entries are removed. Small dictionaries are searched from the front; larger ones have an
/// open-addressing table of entry numbers. The table stores the keys' hashes, so that it can grow
/// without rehashing and a look-up usually compares one key.
struct DictionaryRep : Shared {
  DictionaryRep() : Shared(Kind::Dictionary) {}

  Entry* find(std::string_view key);
  void set(std::string_view key, const String* sharedKey, Value value);
  bool remove(std::string_view key);
  std::size_t size() const { return entries.size() - removed; }

  std::vector<Entry> entries;
  std::uint32_t removed = 0;

 private:
  struct Slot {
    std::uint32_t hash;
    std::uint32_t entry;  // its number + 1, 0 for a free slot
  };

  Entry* find(std::string_view key, std::uint32_t hash);
  void append(Entry entry, std::uint32_t hash);
  void compact();
  void grow();
  void place(Slot slot);

  std::vector<Slot> slots_;  // a power of two
};

}  // namespace tavrel::plist::detail
