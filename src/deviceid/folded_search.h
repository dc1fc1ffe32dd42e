// Case-insensitive search by simple case folding, one code point against one
// code point of the same width, so that a match always spans exactly as many
// UTF-16 code units in the text as the key has ("ß" never matches "ss").
#pragma once

#include <cstdint>
#include <string_view>
#include <vector>

#include "deviceid/unicode_text.h"

namespace qr {
class String;
}

namespace qr::deviceid {

// A key folded once, so that every comparison folds only the text side.
struct FoldedKey {
  struct Point {
    char32_t folded;
    uint8_t width;  // code units: 1, or 2 for a surrogate pair
  };
  std::vector<Point> points;
  size_t units = 0;
  // The key begins or ends with a blank, so the shortcut of the key search
  // (the key stands right after the leading blanks) does not hold for it.
  bool blankAtEdge = false;

  static FoldedKey fromASCII(std::string_view ascii);
  static FoldedKey fromUnits(std::u16string_view units);
  static FoldedKey of(const String& key);
};

// The code point at pos and its width; a lone surrogate stands for itself.
inline char32_t codePointAt(View<char16_t> text, size_t pos, uint8_t& width) noexcept {
  char16_t u = text[pos];
  if (u >= 0xD800 && u <= 0xDBFF && pos + 1 < text.size() && text[pos + 1] >= 0xDC00 &&
      text[pos + 1] <= 0xDFFF) {
    width = 2;
    return 0x10000 + ((static_cast<char32_t>(u) - 0xD800) << 10) + (text[pos + 1] - 0xDC00);
  }
  width = 1;
  return u;
}

// Whether the key matches the text at pos, within the text's bounds.
template <class C>
inline bool matchesAt(View<C> text, size_t pos, const FoldedKey& key) noexcept {
  if (pos > text.size() || text.size() - pos < key.units) return false;
  size_t q = pos;
  for (const FoldedKey::Point& p : key.points) {
    if constexpr (sizeof(C) == 1) {
      if (p.width != 1 || asciiLower(static_cast<unsigned char>(text[q])) != p.folded) return false;
      ++q;
    } else {
      uint8_t width;
      char32_t c = codePointAt(text, q, width);
      if (width != p.width || foldCodePoint(c) != p.folded) return false;
      q += width;
    }
  }
  return true;
}

// The first position where the key matches, or npos. An empty key is never
// found, and no match begins between the halves of a surrogate pair.
template <class C>
inline size_t findFolded(View<C> text, const FoldedKey& key) noexcept {
  if (key.units == 0 || key.units > text.size()) return View<C>::npos;
  size_t last = text.size() - key.units;
  if constexpr (sizeof(C) == 1) {
    // ASCII text: a match can start only at the key's first letter, in either case.
    const FoldedKey::Point& first = key.points.front();
    if (first.width != 1 || first.folded >= 128) return View<C>::npos;
    auto lower = static_cast<char>(first.folded);
    auto upper = lower >= 'a' && lower <= 'z' ? static_cast<char>(lower - 32) : lower;
    for (size_t pos = 0; pos <= last; ++pos)
      if ((text[pos] == lower || text[pos] == upper) && matchesAt(text, pos, key)) return pos;
    return View<C>::npos;
  }
  for (size_t pos = 0; pos <= last; ++pos) {
    if constexpr (sizeof(C) == 2) {
      if (pos > 0 && text[pos] >= 0xDC00 && text[pos] <= 0xDFFF && text[pos - 1] >= 0xD800 &&
          text[pos - 1] <= 0xDBFF)
        continue;
    }
    if (matchesAt(text, pos, key)) return pos;
  }
  return View<C>::npos;
}

}  // namespace qr::deviceid
