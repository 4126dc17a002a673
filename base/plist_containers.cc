#include <algorithm>
#include <cstring>
#include <new>

#include "base/keyed_hash.h"
#include "base/plist.h"
#include "base/plist_reps.h"

namespace tavrel::plist {

namespace detail {
namespace {

// Up to here a walk over the entries is as fast as a table, and smaller.
constexpr std::size_t kLargestUnindexed = 8;

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
  if (slots.empty()) {
    const auto at = std::find_if(entries.begin(), entries.end(), [&](const Entry& entry) {
      return !entry.value.isNull() && entry.key == key;
    });
    return at == entries.end() ? nullptr : &*at;
  }
  const std::size_t mask = slots.size() - 1;
  for (std::size_t slot = keyedHash(key) & mask; slots[slot] != 0; slot = (slot + 1) & mask) {
    Entry& entry = entries[slots[slot] - 1];
    if (!entry.value.isNull() && entry.key == key) return &entry;
  }
  return nullptr;
}

void DictionaryRep::set(std::string_view key, const String* sharedKey, Value value) {
  if (value.isNull()) {
    remove(key);
  } else if (Entry* entry = find(key)) {
    entry->value = std::move(value);
  } else {
    append({sharedKey ? *sharedKey : String(key), std::move(value)});
  }
}

bool DictionaryRep::remove(std::string_view key) {
  Entry* entry = find(key);
  if (!entry) return false;
  entry->value = Value();
  ++removed;
  if (removed * std::size_t{2} >= entries.size()) rebuild();
  return true;
}

void DictionaryRep::append(Entry entry) {
  entries.push_back(std::move(entry));
  if (entries.size() <= kLargestUnindexed) return;
  if (entries.size() * 2 > slots.size()) {
    rebuild();
  } else {
    index(static_cast<std::uint32_t>(entries.size() - 1));
  }
}

void DictionaryRep::rebuild() {
  std::erase_if(entries, [](const Entry& entry) { return entry.value.isNull(); });
  removed = 0;
  slots.clear();
  if (entries.size() <= kLargestUnindexed) return;
  std::size_t size = kLargestUnindexed * 4;
  while (size < entries.size() * 4)
    size *= 2;
  slots.resize(size);
  for (std::uint32_t i = 0; i < entries.size(); ++i)
    index(i);
}

void DictionaryRep::index(std::uint32_t entryNumber) {
  const std::size_t mask = slots.size() - 1;
  std::size_t slot = keyedHash(entries[entryNumber].key) & mask;
  while (slots[slot] != 0)
    slot = (slot + 1) & mask;
  slots[slot] = entryNumber + 1;
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
