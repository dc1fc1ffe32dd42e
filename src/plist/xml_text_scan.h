// What ASCII text needs to become XML element content, and a fast scan for
// the next character that needs anything at all.
#pragma once

#include <cstddef>
#include <cstdint>

#ifdef __SSE2__
#include <emmintrin.h>
#endif

namespace qr::xmlplist {

enum : uint8_t { kPlain, kEscape, kForbidden };

struct AsciiClassTable {
  uint8_t of[128];
  constexpr AsciiClassTable() : of() {
    for (int c = 0; c < 0x20; ++c) of[c] = kForbidden;  // XML 1.0 has no such characters
    of[int('\t')] = of[int('\n')] = kPlain;
    of[int('\r')] = of[int('&')] = of[int('<')] = of[int('>')] = kEscape;
  }
  constexpr uint8_t operator[](unsigned c) const { return of[c]; }
};
inline constexpr AsciiClassTable kAsciiClass;

namespace detail {
// Bytes from 0x80 up too, as the signed compare below finds them.
inline bool needsLook(unsigned char c) noexcept {
  return c < 0x20 || c >= 0x80 || c == '&' || c == '<' || c == '>';
}
#ifdef __SSE2__
// Bit i set where byte i of the 16 at s needs a look.
inline unsigned lookMask(const char* s) noexcept {
  const __m128i v = _mm_loadu_si128(reinterpret_cast<const __m128i*>(s));
  const __m128i hit =
      _mm_or_si128(_mm_cmplt_epi8(v, _mm_set1_epi8(0x20)),
                   _mm_or_si128(_mm_cmpeq_epi8(v, _mm_set1_epi8('&')),
                                _mm_or_si128(_mm_cmpeq_epi8(v, _mm_set1_epi8('<')),
                                             _mm_cmpeq_epi8(v, _mm_set1_epi8('>')))));
  return static_cast<unsigned>(_mm_movemask_epi8(hit));
}
#endif
}  // namespace detail

// The number of leading ASCII bytes that need nothing. It also stops at tab
// and line feed, which cost the caller only a look at the table.
inline size_t plainRun(const char* s, size_t n) noexcept {
#ifdef __SSE2__
  if (n >= 16) {
    size_t i = 0;
    for (; i + 16 <= n; i += 16)
      if (unsigned mask = detail::lookMask(s + i)) return i + size_t(__builtin_ctz(mask));
    if (i == n) return n;
    // The last 16 bytes again, ignoring those already looked at.
    unsigned mask = detail::lookMask(s + n - 16) >> (16 - (n - i));
    return mask ? i + size_t(__builtin_ctz(mask)) : n;
  }
#endif
  size_t i = 0;
  while (i < n && !detail::needsLook(static_cast<unsigned char>(s[i]))) ++i;
  return i;
}

}  // namespace qr::xmlplist
