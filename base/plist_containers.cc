#include <algorithm>
#include <bit>
#include <cstring>
#include <new>

#include "base/keyed_hash.h"
#include "base/plist.h"
#include "base/plist_reps.h"

namespace tavrel::plist {

namespace detail {
namespace {

// Up to this size, a walk over the entries is as fast as a table, and needs less memory.
constexpr std::size_t kLargestUnindexed = 16;

std::uint32_t hashOf(std::string_view key) {
  return static_cast<std::uint32_t>(keyedHash(key));
}

std::size_t slotsFor(std::size_t entries) {
  return std::bit_ceil(entries * 4);
}

}  // namespace

void destroy(Shared* object) {
  switch (object->kind) {
    case Kind::String: {
      auto* rep = static_cast<StringRep*>(object);
      rep->~StringRep();
      ::operator delete(rep);
      break;
    }
    case Kind::Data:
      delete static_cast<DataRep*>(object);
      break;
    case Kind::Array:
      delete static_cast<ArrayRep*>(object);
      break;
    case Kind::Dictionary:
      delete static_cast<DictionaryRep*>(object);
      break;
    default:
      break;
  }
}

Entry* DictionaryRep::find(std::string_view key) {
  return find(key, slots_.empty() ? 0 : hashOf(key));
}

Entry* DictionaryRep::find(std::string_view key, std::uint32_t hash) {
  if (slots_.empty()) {
    const auto at = std::find_if(entries.begin(), entries.end(), [&](const Entry& entry) {
      return !entry.value.isNull() && entry.key == key;
    });
    return at == entries.end() ? nullptr : &*at;
  }
  const std::size_t mask = slots_.size() - 1;
  for (std::size_t i = hash & mask; slots_[i].entry != 0; i = (i + 1) & mask) {
    if (slots_[i].hash != hash) continue;
    Entry& entry = entries[slots_[i].entry - 1];
    if (!entry.value.isNull() && entry.key == key) return &entry;
  }
  return nullptr;
}

void DictionaryRep::set(std::string_view key, const String* sharedKey, Value value) {
  if (value.isNull()) {
    remove(key);
    return;
  }
  const bool isIndexed = !slots_.empty() || entries.size() == kLargestUnindexed;
  const std::uint32_t hash = isIndexed ? hashOf(key) : 0;
  if (Entry* entry = find(key, hash)) {
    entry->value = std::move(value);
  } else {
    append({sharedKey ? *sharedKey : String(key), std::move(value)}, hash);
  }
}

bool DictionaryRep::remove(std::string_view key) {
  Entry* entry = find(key);
  if (!entry) return false;
  entry->value = Value();
  ++removed;
  if (removed * std::size_t{2} >= entries.size()) compact();
  return true;
}

void DictionaryRep::append(Entry entry, std::uint32_t hash) {
  entries.push_back(std::move(entry));
  if (entries.size() <= kLargestUnindexed) return;
  if (entries.size() * 2 > slots_.size()) grow();
  place({hash, static_cast<std::uint32_t>(entries.size())});
}

// Drops the removed entries.
void DictionaryRep::compact() {
  std::erase_if(entries, [](const Entry& entry) { return entry.value.isNull(); });
  removed = 0;
  slots_.clear();
  if (entries.size() <= kLargestUnindexed) return;
  slots_.resize(slotsFor(entries.size()));
  for (std::uint32_t i = 0; i < entries.size(); ++i)
    place({hashOf(entries[i].key), i + 1});
}

// Makes room for the last entry, which is not placed yet, and for the reserved entries.
void DictionaryRep::grow() {
  std::vector<Slot> old(slotsFor(std::max(entries.size(), entries.capacity() / 2)));
  old.swap(slots_);
  if (old.empty()) {
    for (std::uint32_t i = 0; i + 1 < entries.size(); ++i)
      place({hashOf(entries[i].key), i + 1});
  }
  for (const Slot& slot : old) {
    if (slot.entry != 0) place(slot);
  }
}

void DictionaryRep::place(Slot slot) {
  const std::size_t mask = slots_.size() - 1;
  std::size_t i = slot.hash & mask;
  while (slots_[i].entry != 0)
    i = (i + 1) & mask;
  slots_[i] = slot;
}

}  // namespace detail

using detail::ArrayRep;
using detail::DataRep;
using detail::DictionaryRep;
using detail::Ref;
using detail::StringRep;

// -- String -------------------------------------------------------------------------------------

String::String(std::string_view text) {
  if (text.empty()) return;
  void* memory = ::operator new(sizeof(StringRep) + text.size());
  auto* rep = new (memory) StringRep(text.size());
  std::memcpy(static_cast<char*>(memory) + sizeof(StringRep), text.data(), text.size());
  rep_ = Ref<StringRep>(rep);
}

std::string_view String::view() const {
  if (!rep_) return {};
  return {rep_->text(), rep_->length};
}

// -- Dictionary ---------------------------------------------------------------------------------

Dictionary::Dictionary(std::initializer_list<Entry> entries) : Dictionary(create(entries.size())) {
  for (const Entry& entry : entries)
    set(entry.key, entry.value);
}

Dictionary Dictionary::create(std::size_t capacity) {
  Dictionary created;
  created.ownRep().entries.reserve(capacity);
  return created;
}

DictionaryRep& Dictionary::ownRep() {
  if (!rep_) rep_ = Ref<DictionaryRep>(new DictionaryRep);
  return *rep_;
}

std::size_t Dictionary::size() const {
  return rep_ ? rep_->size() : 0;
}

const Value* Dictionary::find(std::string_view key) const {
  Entry* entry = rep_ ? rep_->find(key) : nullptr;
  return entry ? &entry->value : nullptr;
}

Value Dictionary::get(std::string_view key) const {
  const Value* value = find(key);
  return value ? *value : Value();
}

std::optional<std::string_view> Dictionary::string(std::string_view key) const {
  const Value* value = find(key);
  return value ? value->string() : std::nullopt;
}

std::optional<Number> Dictionary::number(std::string_view key) const {
  const Value* value = find(key);
  return value ? value->number() : std::nullopt;
}

std::optional<bool> Dictionary::boolean(std::string_view key) const {
  const Value* value = find(key);
  return value ? value->boolean() : std::nullopt;
}

std::optional<Date> Dictionary::date(std::string_view key) const {
  const Value* value = find(key);
  return value ? value->date() : std::nullopt;
}

Dictionary Dictionary::dictionary(std::string_view key) const {
  const Value* value = find(key);
  return value ? value->dictionary() : Dictionary();
}

Array Dictionary::array(std::string_view key) const {
  const Value* value = find(key);
  return value ? value->array() : Array();
}

Data Dictionary::data(std::string_view key) const {
  const Value* value = find(key);
  return value ? value->data() : Data();
}

void Dictionary::set(std::string_view key, Value value) {
  ownRep().set(key, nullptr, std::move(value));
}

void Dictionary::setShared(const String& key, Value value) {
  ownRep().set(key.view(), &key, std::move(value));
}

bool Dictionary::remove(std::string_view key) {
  return rep_ && rep_->remove(key);
}

Dictionary::Iterator Dictionary::begin() const {
  if (!rep_) return {};
  const auto& entries = rep_->entries;
  return {entries.data(), entries.data() + entries.size()};
}

// -- Array --------------------------------------------------------------------------------------

Array::Array(std::initializer_list<Value> values) : Array(create(values.size())) {
  for (const Value& value : values)
    append(value);
}

Array Array::create(std::size_t capacity) {
  Array created;
  created.ownRep().values.reserve(capacity);
  return created;
}

ArrayRep& Array::ownRep() {
  if (!rep_) rep_ = Ref<ArrayRep>(new ArrayRep);
  return *rep_;
}

std::size_t Array::size() const {
  return rep_ ? rep_->values.size() : 0;
}

Value Array::at(std::size_t index) const {
  return index < size() ? rep_->values[index] : Value();
}

void Array::set(std::size_t index, Value value) {
  if (index < size()) rep_->values[index] = std::move(value);
}

void Array::append(Value value) {
  ownRep().values.push_back(std::move(value));
}

void Array::remove(std::size_t index) {
  if (index >= size()) return;
  rep_->values.erase(rep_->values.begin() + static_cast<std::ptrdiff_t>(index));
}

const Value* Array::begin() const {
  return rep_ ? rep_->values.data() : nullptr;
}
const Value* Array::end() const {
  return rep_ ? rep_->values.data() + size() : nullptr;
}

// -- Data ---------------------------------------------------------------------------------------

Data::Data(ByteSpan bytes) : rep_(new DataRep) {
  rep_->bytes.assign(bytes.begin(), bytes.end());
}

MutableByteSpan Data::bytes() const {
  if (!rep_) return {};
  return rep_->bytes;
}

// -- Copies -------------------------------------------------------------------------------------

Dictionary mutableCopy(const Dictionary& dictionary) {
  Dictionary copy = Dictionary::create(dictionary.size());
  for (const Entry& entry : dictionary)
    copy.set(entry.key, entry.value);
  return copy;
}

Array mutableCopy(const Array& array) {
  Array copy = Array::create(array.size());
  for (const Value& value : array)
    copy.append(value);
  return copy;
}

Data mutableCopy(const Data& data) {
  return Data(data.bytes());
}

Value deepCopy(const Value& value) {
  switch (value.kind()) {
    case Kind::Dictionary: {
      const Dictionary original = value.dictionary();
      Dictionary copy = Dictionary::create(original.size());
      for (const Entry& entry : original)
        copy.set(entry.key, deepCopy(entry.value));
      return copy;
    }
    case Kind::Array: {
      const Array original = value.array();
      Array copy = Array::create(original.size());
      for (const Value& element : original)
        copy.append(deepCopy(element));
      return copy;
    }
    case Kind::Data:
      return mutableCopy(value.data());
    default:
      return value;
  }
}

}  // namespace tavrel::plist
