// The entries of a dictionary, sorted by key.
#pragma once

#include <algorithm>
#include <vector>

#include "base/plist.h"

namespace tavrel {

/// The entries are borrowed from the dictionary.
inline std::vector<const plist::Entry*> sortedEntries(const plist::Dictionary& dictionary) {
  std::vector<const plist::Entry*> entries;
  entries.reserve(dictionary.size());
  for (const plist::Entry& entry : dictionary)
    entries.push_back(&entry);
  std::sort(entries.begin(), entries.end(),
            [](const auto* a, const auto* b) { return a->key.view() < b->key.view(); });
  return entries;
}

}  // namespace tavrel
