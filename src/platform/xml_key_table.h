// Shares one string object among equal dictionary keys within one parse: a
// cache file repeats the same few keys hundreds of thousands of times, and
// strings are immutable, so one object per distinct key is enough.
#pragma once

#include <cstddef>
#include <string_view>
#include <vector>

#include "platform/string.h"

namespace qr::xmlplist {

class KeyTable {
 public:
  // The shared string for the UTF-8 text; null when it is not UTF-8.
  Ref<String> intern(std::string_view utf8);

 private:
  struct Slot {
    size_t hash = 0;
    Ref<String> key;
  };
  void grow();

  std::vector<Slot> slots_;  // power-of-two size, at most half full
  size_t used_ = 0;
};

}  // namespace qr::xmlplist
