/* The keys of the process. Look-ups take no locks, so that a child of a multithreaded process can
 * look keys up too. Names are in static memory, at the same offsets as in segments. */
#include <string.h>

#include "internal.h"

enum { kBuckets = 2 * kBHKeys };

static char names[kBHNamesBytes];
static _Atomic uint32_t usedNames;
static _Atomic uint32_t usedKeys;
static uint64_t entries[kBHKeys];          /* in a segment's format */
static _Atomic uint32_t buckets[kBuckets]; /* index + 1 */
static _Atomic int refusal;                /* why a key was refused last */

static struct Key refusedKey;

BHClientStatus bhRefusal(void) {
  return (BHClientStatus)atomic_load_explicit(&refusal, memory_order_relaxed);
}

bool bhIsKey(const struct Process* process, const struct Key* key) {
  return process && key >= process->state->keys && key < process->state->keys + kBHKeys;
}

static uint32_t offsetOf(uint64_t entry) {
  return (uint32_t)entry;
}
static uint32_t lengthOf(uint64_t entry) {
  return (uint32_t)(entry >> 32) & 0xffff;
}

static uint32_t hashOf(const char* name, uint32_t length, uint32_t kind) {
  uint32_t hash = 2166136261U ^ kind;
  for (uint32_t i = 0; i < length; ++i)
    hash = (hash ^ (unsigned char)name[i]) * 16777619U;
  return hash;
}

/* Reserves `amount` out of `limit`; returns where it begins, or `limit` when it does not fit. */
static uint32_t take(_Atomic uint32_t* used, uint32_t amount, uint32_t limit) {
  uint32_t start = atomic_load(used);
  do {
    if (amount > limit - start) return limit;
  } while (!atomic_compare_exchange_weak(used, &start, start + amount));
  return start;
}

/* Adds a key; returns its index + 1, or 0 when there is no room. */
static uint32_t addKey(const char* name, uint32_t length, uint32_t kind) {
  const uint32_t offset = take(&usedNames, length, kBHNamesBytes);
  if (offset == kBHNamesBytes) return 0;
  const uint32_t index = take(&usedKeys, 1, kBHKeys);
  if (index == kBHKeys) return 0;
  memcpy(names + offset, name, length);
  entries[index] = offset | (uint64_t)length << 32 | (uint64_t)kind << 48;
  return index + 1;
}

static struct Key* refuse(BHClientStatus why) {
  atomic_store_explicit(&refusal, why, memory_order_relaxed);
  return &refusedKey;
}

/* The length of the character at the beginning of a text that ends with a zero. 0 when it is a
 * control character, or not well-formed UTF-8: too long, a surrogate, or beyond U+10FFFF. */
static size_t lengthOfCharacter(const unsigned char* text) {
  const unsigned char first = text[0];
  if (first < 0x80) return first >= ' ' && first != 127;
  if (first < 0xc2 || first > 0xf4) return 0;
  const size_t length = first < 0xe0 ? 2 : first < 0xf0 ? 3 : 4;
  const unsigned char least = first == 0xe0 ? 0xa0 : first == 0xf0 ? 0x90 : 0x80;
  const unsigned char most = first == 0xed ? 0x9f : first == 0xf4 ? 0x8f : 0xbf;
  if (text[1] < least || text[1] > most) return 0;
  for (size_t i = 2; i < length; ++i) {
    if (text[i] < 0x80 || text[i] > 0xbf) return 0;
  }
  return length;
}

/* The length of a name, 0 for an invalid one. */
static size_t lengthOfName(const char* name) {
  const size_t length = name ? strnlen(name, kBHLongestName + 1) : 0;
  if (length > kBHLongestName) return 0;
  for (size_t at = 0; at < length;) {
    const size_t step = lengthOfCharacter((const unsigned char*)name + at);
    if (step == 0) return 0;
    at += step;
  }
  return length;
}

static struct Key* keyFor(const char* name, uint32_t kind) {
  const int error = errno;
  BHClientStatus status = BHClientStatusFailed;
  struct Process* process = bhMakeProcess(&status);
  errno = error;
  if (!process) return refuse(status);
  const size_t length = lengthOfName(name);
  if (length == 0) return refuse(BHClientStatusKeyRefused);

  uint32_t added = 0;
  for (uint32_t at = hashOf(name, (uint32_t)length, kind);; ++at) {
    uint32_t found = atomic_load_explicit(&buckets[at % kBuckets], memory_order_acquire);
    if (found == 0) {
      if (added == 0) added = addKey(name, (uint32_t)length, kind);
      if (added == 0) return refuse(BHClientStatusKeyRefused);
      /* The loser of a race leaves its entry unused. */
      if (atomic_compare_exchange_strong_explicit(&buckets[at % kBuckets], &found, added,
                                                  memory_order_acq_rel, memory_order_acquire)) {
        return &process->state->keys[added - 1];
      }
    }
    const uint64_t entry = entries[found - 1];
    if (entry >> 48 == kind && lengthOf(entry) == length &&
        memcmp(names + offsetOf(entry), name, length) == 0) {
      return &process->state->keys[found - 1];
    }
  }
}

BHClientScalarKey* BHClientScalarForKey(const char* key) {
  return (BHClientScalarKey*)keyFor(key, kBHKindScalar);
}

BHClientDistributionKey* BHClientDistributionForKey(const char* key) {
  return (BHClientDistributionKey*)keyFor(key, kBHKindDistribution);
}

uint32_t bhNameKey(struct Process* process, struct Segment* segment, struct Key* key) {
  uint32_t number = atomic_load_explicit(&key->number, memory_order_relaxed);
  if (number != 0) return number;
  const uint32_t index = (uint32_t)(key - process->state->keys);
  const uint64_t entry = entries[index];
  const char* from = names + offsetOf(entry);
  _Atomic char* to = segment->names + offsetOf(entry);
  if (!bhFetch(to, lengthOf(entry)) ||
      !bhFetch(&segment->keys[index], sizeof segment->keys[index])) {
    return 0;
  }
  /* Threads that do this at the same time write the same bytes. */
  for (uint32_t i = 0; i < lengthOf(entry); ++i)
    atomic_store_explicit(&to[i], from[i], memory_order_relaxed);
  atomic_store_explicit(&segment->keys[index], entry, memory_order_release);
  atomic_store_explicit(&key->number, index + 1, memory_order_release);
  return index + 1;
}
