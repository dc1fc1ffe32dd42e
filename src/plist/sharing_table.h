// What the tables that share equal strings within one read or one write have
// in common: open addressing with linear probes over slots that keep their
// hash, and a word-at-a-time hash of the text. The hash is not keyed: outside
// input chooses the text, so every table bounds its probes and stops sharing,
// rather than slowing down, when text collides.
#pragma once

#include <cstddef>
#include <cstdint>
#include <cstring>
#include <string_view>
#include <vector>

namespace qr {

// How far a lookup probes before it gives up sharing the text: crafted text
// that collides costs room, never a parse or write turned quadratic.
inline constexpr size_t kMaxSharingProbes = 32;

inline uint64_t quickTextHash(std::string_view s) noexcept {
  uint64_t h = 0x9E3779B97F4A7C15ull ^ s.size();
  const char* p = s.data();
  size_t n = s.size();
  for (; n >= 8; p += 8, n -= 8) {
    uint64_t w;
    std::memcpy(&w, p, 8);
    h = (h ^ w) * 0xBF58476D1CE4E5B9ull;
    h ^= h >> 31;
  }
  if (n) {
    uint64_t w = 0;
    std::memcpy(&w, p, n);
    h = (h ^ w) * 0x94D049BB133111EBull;
  }
  return h ^ (h >> 29);
}

// Makes the table `size` slots (a power of two) and places again every slot
// for which occupied(slot) holds.
template <class Slot, class Occupied>
void rehashTable(std::vector<Slot>& slots, size_t size, Occupied occupied) {
  std::vector<Slot> old(size, Slot{});
  old.swap(slots);
  size_t mask = size - 1;
  for (const Slot& s : old) {
    if (!occupied(s)) continue;
    size_t i = s.hash & mask;
    while (occupied(slots[i])) i = (i + 1) & mask;
    slots[i] = s;
  }
}

}  // namespace qr
