// Character classes, case folding and lower-casing for device ID text, over
// views of either storage width: char for narrow (ASCII) strings, char16_t for
// wide ones. Only non-ASCII units reach ICU.
#pragma once

#include <string>
#include <string_view>

#include "deviceid/ascii_text.h"

namespace qr::deviceid {

template <class C>
using View = std::basic_string_view<C>;
template <class C>
using Buffer = std::basic_string<C>;

// Tab and the space separators (general category Zs).
bool isUnicodeBlank(char16_t unit) noexcept;
// The blanks plus LF, VT, FF, CR, NEL, LINE SEPARATOR and PARAGRAPH SEPARATOR.
bool isUnicodeBlankOrNewline(char16_t unit) noexcept;
// Simple (one-to-one) default case folding of one code point.
char32_t unicodeFold(char32_t codePoint) noexcept;
// Full lower-casing with the root locale's rules; lengths may change.
std::u16string unicodeLowercase(std::u16string_view units);

template <class C>
inline bool isBlank(C unit) noexcept {
  if constexpr (sizeof(C) == 1)
    return isASCIIBlank(static_cast<unsigned char>(unit));
  else
    return unit < 0x80 ? isASCIIBlank(unit) : isUnicodeBlank(unit);
}

template <class C>
inline bool isBlankOrNewline(C unit) noexcept {
  if constexpr (sizeof(C) == 1)
    return isASCIIBlankOrNewline(static_cast<unsigned char>(unit));
  else
    return unit < 0x80 ? isASCIIBlankOrNewline(unit) : isUnicodeBlankOrNewline(unit);
}

inline char32_t foldCodePoint(char32_t c) noexcept {
  return c < 0x80 ? asciiLower(c) : unicodeFold(c);
}

// Removes the units for which isSpace holds from both ends.
template <class C, class IsSpace>
inline View<C> trimmed(View<C> text, IsSpace isSpace) noexcept {
  size_t begin = 0, end = text.size();
  while (begin < end && isSpace(text[begin])) ++begin;
  while (end > begin && isSpace(text[end - 1])) --end;
  return text.substr(begin, end - begin);
}

template <class C>
inline View<C> trimBlank(View<C> text) noexcept {
  return trimmed(text, [](C u) { return isBlank(u); });
}

template <class C>
inline View<C> trimBlankOrNewline(View<C> text) noexcept {
  return trimmed(text, [](C u) { return isBlankOrNewline(u); });
}

// Full lower-casing; ASCII text stays on the plain path.
template <class C>
Buffer<C> lowercase(View<C> text);

// Exact code-unit prefix test against ASCII text.
template <class C>
inline bool hasASCIIPrefix(View<C> text, std::string_view prefix) noexcept {
  if (prefix.size() > text.size()) return false;
  for (size_t i = 0; i < prefix.size(); ++i)
    if (text[i] != static_cast<C>(static_cast<unsigned char>(prefix[i]))) return false;
  return true;
}

template <class C>
inline void appendASCII(Buffer<C>& out, std::string_view ascii) {
  if constexpr (sizeof(C) == 1)
    out += ascii;
  else
    out.append(ascii.begin(), ascii.end());
}

}  // namespace qr::deviceid
