#include "sqlite_memory.h"

#include <algorithm>
#include <array>
#include <bit>
#include <cstdlib>
#include <cstring>
#include <sanitizer/asan_interface.h>
#include <sqlite3.h>
#include <utility>
#include <vector>

#include "require.h"

namespace tavrel::fuzz {
namespace {

// Before each block. Poisoned like everything outside blocks, so only functions without the
// sanitizer's checks touch it.
struct alignas(16) Head {
  std::size_t bytes;
  Head* next;  // of the free blocks of the same size
};

struct FreeBlocks {
  Head* first = nullptr;
  Head* last = nullptr;
  std::size_t count = 0;
};

constexpr std::size_t kSlab = 1U << 20;
// Larger blocks are rare and come from ASan's allocator.
constexpr std::size_t kLargest = 1U << 16;
// Blocks are reused in the order in which they became free, and only while there are as many as
// this, so that uses of freed memory are noticed.
constexpr std::size_t kKeptFree = 32;

struct Pool {
  std::array<FreeBlocks, 18> free;  // by the logarithm of the size
  std::vector<std::byte*> slabs;
  std::byte* rest = nullptr;  // of the last slab
  std::size_t restBytes = 0;
  std::size_t held = 0;
};

// SQLite's functions have no argument that could carry it. It lives as long as connections that are
// never closed.
Pool& pool() {
  static Pool& only = *new Pool;
  return only;
}

std::size_t rounded(std::size_t bytes) {
  return (bytes + 7) & ~std::size_t{7};
}

// At least a head is left between two blocks.
unsigned sizeClass(std::size_t bytes) {
  return static_cast<unsigned>(std::bit_width(std::max<std::size_t>(bytes, 16) + sizeof(Head) - 1));
}

std::byte* carve(unsigned sizeClass) {
  Pool& from = pool();
  const std::size_t size = std::size_t{1} << sizeClass;
  if (size > from.restBytes) {
    from.rest = static_cast<std::byte*>(std::malloc(kSlab));
    require(from.rest != nullptr);
    from.slabs.push_back(from.rest);
    from.restBytes = kSlab;
    ASAN_POISON_MEMORY_REGION(from.rest, kSlab);
  }
  from.restBytes -= size;
  return std::exchange(from.rest, from.rest + size);
}

__attribute__((no_sanitize("address"))) Head* takeBlock(unsigned sizeClass) {
  FreeBlocks& free = pool().free[sizeClass];
  if (free.count <= kKeptFree) return reinterpret_cast<Head*>(carve(sizeClass));
  --free.count;
  Head* const head = free.first;
  free.first = head->next;
  return head;
}

__attribute__((no_sanitize("address"))) void* allocate(int wanted) {
  const std::size_t bytes = rounded(static_cast<std::size_t>(wanted));
  Head* const head = bytes > kLargest ? static_cast<Head*>(std::malloc(sizeof(Head) + bytes))
                                      : takeBlock(sizeClass(bytes));
  if (!head) return nullptr;
  head->bytes = bytes;
  ++pool().held;
  ASAN_UNPOISON_MEMORY_REGION(head + 1, bytes);
  return head + 1;
}

__attribute__((no_sanitize("address"))) int sizeOf(void* block) {
  return block ? static_cast<int>((static_cast<Head*>(block) - 1)->bytes) : 0;
}

__attribute__((no_sanitize("address"))) void release(void* block) {
  Head* const head = static_cast<Head*>(block) - 1;
  --pool().held;
  if (head->bytes > kLargest) return std::free(head);
  FreeBlocks& free = pool().free[sizeClass(head->bytes)];
  ASAN_POISON_MEMORY_REGION(block, head->bytes);
  head->next = nullptr;
  (free.count++ == 0 ? free.first : free.last->next) = head;
  free.last = head;
}

void* resize(void* block, int wanted) {
  void* const made = allocate(wanted);
  if (!made) return nullptr;
  std::memcpy(made, block, static_cast<std::size_t>(std::min(sizeOf(block), wanted)));
  release(block);
  return made;
}

}  // namespace

void setUpSqliteMemory() {
  static const sqlite3_mem_methods methods{
      allocate,
      release,
      resize,
      sizeOf,
      [](int bytes) { return static_cast<int>(rounded(static_cast<std::size_t>(bytes))); },
      [](void*) { return SQLITE_OK; },
      [](void*) {},
      nullptr};
  require(sqlite3_config(SQLITE_CONFIG_MALLOC, &methods) == SQLITE_OK);
  // Counting takes a mutex for each block. Parts of larger blocks would not have bounds of their
  // own.
  require(sqlite3_config(SQLITE_CONFIG_MEMSTATUS, 0) == SQLITE_OK);
  require(sqlite3_config(SQLITE_CONFIG_LOOKASIDE, 0, 0) == SQLITE_OK);
  require(sqlite3_initialize() == SQLITE_OK);
}

std::size_t sqliteBlocks() {
  return pool().held;
}

}  // namespace tavrel::fuzz
