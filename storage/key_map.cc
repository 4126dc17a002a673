#include "storage/key_map.h"

#include <array>
#include <cstddef>
#include <cstdint>

namespace tavrel {
namespace {

constexpr std::size_t kSlots = 1024;
static_assert(keyMap.size() * 2 <= kSlots && (kSlots & (kSlots - 1)) == 0);

constexpr std::size_t firstSlot(std::string_view name) {
  std::uint32_t hash = 2166136261;
  for (const char c : name)
    hash = (hash ^ static_cast<unsigned char>(c)) * 16777619;
  return (hash ^ hash >> 16) % kSlots;
}

// Row numbers + 1 in an open-addressing table, 0 for a free slot. Of rows with the same name, only
// the first is stored, as a search from the front would find it.
constexpr auto kRowsBySlot = [] {
  std::array<std::uint16_t, kSlots> slots{};
  for (std::size_t row = 0; row < keyMap.size(); ++row) {
    std::size_t slot = firstSlot(keyMap[row].name);
    while (slots[slot] != 0 && keyMap[slots[slot] - 1U].name != keyMap[row].name)
      slot = (slot + 1) % kSlots;
    if (slots[slot] == 0) slots[slot] = static_cast<std::uint16_t>(row + 1);
  }
  return slots;
}();

}  // namespace

const KeyMapRow* findKeyMapRow(std::string_view name) {
  for (std::size_t slot = firstSlot(name); kRowsBySlot[slot] != 0; slot = (slot + 1) % kSlots) {
    const KeyMapRow& row = keyMap[kRowsBySlot[slot] - 1U];
    if (row.name == name) return &row;
  }
  return nullptr;
}

}  // namespace tavrel
