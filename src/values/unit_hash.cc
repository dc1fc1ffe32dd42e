// Keyed hashing of text, so that outside input (Info dictionaries, a cache on
// standard input) cannot choose keys that all land in one run of a
// dictionary's index. SipHash-1-3 over the UTF-16 code units, with a key drawn
// once per process: narrow and wide storage of the same text hash alike.
#include <sys/random.h>
#include <unistd.h>

#include <chrono>
#include <cstdint>

#include "values/string.h"

namespace qr {
namespace {

struct SipKey {
  uint64_t k0, k1;
};

const SipKey& processKey() {
  static const SipKey key = [] {
    SipKey k{};
    if (getrandom(&k, sizeof k, GRND_NONBLOCK) != static_cast<ssize_t>(sizeof k)) {
      // No entropy this early in boot: still a key no input can know in advance.
      auto now = static_cast<uint64_t>(std::chrono::steady_clock::now().time_since_epoch().count());
      k.k0 = now ^ reinterpret_cast<uintptr_t>(&k);
      k.k1 = (now * 0x9E3779B97F4A7C15ull) ^ static_cast<uint64_t>(getpid());
    }
    return k;
  }();
  return key;
}

constexpr uint64_t rotl(uint64_t x, int b) { return (x << b) | (x >> (64 - b)); }

class SipHash13 {
 public:
  SipHash13() {
    const SipKey& k = processKey();
    v0_ = k.k0 ^ 0x736f6d6570736575ull;
    v1_ = k.k1 ^ 0x646f72616e646f6dull;
    v2_ = k.k0 ^ 0x6c7967656e657261ull;
    v3_ = k.k1 ^ 0x7465646279746573ull;
  }
  void block(uint64_t m) {
    v3_ ^= m;
    round();
    v0_ ^= m;
  }
  uint64_t finish(uint64_t lastBlock) {
    block(lastBlock);
    v2_ ^= 0xff;
    round();
    round();
    round();
    return v0_ ^ v1_ ^ v2_ ^ v3_;
  }

 private:
  void round() {
    v0_ += v1_;
    v1_ = rotl(v1_, 13) ^ v0_;
    v0_ = rotl(v0_, 32);
    v2_ += v3_;
    v3_ = rotl(v3_, 16) ^ v2_;
    v0_ += v3_;
    v3_ = rotl(v3_, 21) ^ v0_;
    v2_ += v1_;
    v1_ = rotl(v1_, 17) ^ v2_;
    v2_ = rotl(v2_, 32);
  }
  uint64_t v0_, v1_, v2_, v3_;
};

template <class Unit>
uint64_t unitValue(Unit c) {
  if constexpr (sizeof(Unit) == 1)
    return static_cast<unsigned char>(c);
  else
    return static_cast<uint16_t>(c);
}

// Four units as one block, the first in the low bits (compilers make this one load).
template <class Unit>
uint64_t block4(const Unit* p) {
  return unitValue(p[0]) | unitValue(p[1]) << 16 | unitValue(p[2]) << 32 | unitValue(p[3]) << 48;
}

template <class Unit>
size_t hashUnits(const Unit* p, size_t n) noexcept {
  SipHash13 h;
  size_t i = 0;
  for (; i + 4 <= n; i += 4) h.block(block4(p + i));
  uint64_t last = static_cast<uint64_t>(2 * n) << 56;
  for (int shift = 0; i < n; ++i, shift += 16) last |= unitValue(p[i]) << shift;
  return static_cast<size_t>(h.finish(last));
}

}  // namespace

size_t hashCodeUnits(std::string_view narrow) noexcept {
  return hashUnits(narrow.data(), narrow.size());
}

size_t hashCodeUnits(std::u16string_view wide) noexcept {
  return hashUnits(wide.data(), wide.size());
}

}  // namespace qr
