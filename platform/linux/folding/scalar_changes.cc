#include "platform/linux/folding/scalar_changes.h"

#include "base/arithmetic.h"

namespace tavrel {

ScalarChanges::Change& ScalarChanges::changeOf(std::int32_t day, std::string_view key) {
  auto found = changes_.find(std::pair(day, key));
  if (found == changes_.end()) {
    found = changes_.emplace(RowName(day, key), Change()).first;
    bytes_ += key.size();
  }
  return found->second;
}

void ScalarChanges::set(std::int32_t day, std::string_view key, std::int64_t value,
                        std::int64_t added) {
  Change& change = changeOf(day, key);
  change.isSet = true;
  change.value = value;
  change.added = added;
}

void ScalarChanges::add(std::int32_t day, std::string_view key, std::int64_t amount) {
  Change& change = changeOf(day, key);
  std::int64_t sum = 0;
  if (__builtin_add_overflow(change.added, amount, &sum)) return void(++overflows_);
  change.added = sum;
}

Status ScalarChanges::giveTo(SqliteBatch& batch) {
  // Read all before writing the first: a read in between would make the batch write each one alone.
  for (auto& [name, change] : changes_) {
    if (!change.isSet) {
      const auto value = batch.scalar(name.first, name.second);
      if (!value) return value.error();
      change.value = value->value_or(0);
    }
    if (__builtin_add_overflow(change.value, change.added, &change.value)) {
      change.value = wrappingSubtract(change.value, change.added);
      ++overflows_;
    }
  }
  for (const auto& [name, change] : changes_) {
    if (Status done = batch.setScalar(name.first, name.second, change.value); !done) return done;
  }
  return Done{};
}

}  // namespace tavrel
