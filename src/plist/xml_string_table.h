// Shares one string object among equal strings within one parse. A cache
// file repeats the same few keys, and many of the same short values (kinds,
// makes, versions), hundreds of thousands of times; immutable strings can be
// shared, which saves both the allocations and the memory.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

#include "values/string.h"

namespace qr::xmlplist {

class StringTable {
 public:
  // At most `capacity` distinct strings are kept; past that, lookups still
  // find the ones kept but new text gets its own object.
  explicit StringTable(size_t capacity) : capacity_(capacity) {}
  StringTable(const StringTable&) = delete;
  StringTable& operator=(const StringTable&) = delete;
  ~StringTable();

  // The shared string for ASCII text; null for anything else, which the
  // caller makes its own string for (its stored form is not the text).
  Ref<String> intern(std::string_view ascii);

 private:
  struct Slot {
    uint64_t hash = 0;
    String* string = nullptr;  // holds one reference
  };
  void grow();
  static size_t recentIndex(std::string_view text) noexcept;

  std::vector<Slot> slots_;  // power-of-two size, at most half full
  // Strings of slots_ last found or added, by a few of their bytes: a file
  // repeats a handful of keys, which this finds without hashing them or
  // reaching into the large table.
  static constexpr size_t kRecent = 64;
  String* recent_[kRecent] = {};
  size_t used_ = 0;
  size_t capacity_;
};

}  // namespace qr::xmlplist
