// The tags of a plain property list as words to compare the input with, 16
// bytes at a time: a usual start or end tag then costs two loads, masks and
// compares rather than a loop over its letters. The words are laid out for a
// little-endian machine; on any other nothing matches, and the byte-by-byte
// path reads every tag.
#pragma once

#include <cstdint>
#include <cstring>
#include <string_view>

#include "plist/xml_value_builder.h"

namespace qr::xmlplist {

struct TagWords {
  uint64_t low = 0, lowMask = 0, high = 0, highMask = 0;
  uint8_t length = 0;

  constexpr explicit TagWords(std::string_view text) : length(uint8_t(text.size())) {
    for (size_t i = 0; i < text.size() && i < 16; ++i) {
      uint64_t byte = static_cast<unsigned char>(text[i]);
      uint64_t& word = i < 8 ? low : high;
      uint64_t& mask = i < 8 ? lowMask : highMask;
      word |= byte << (i % 8 * 8);
      mask |= uint64_t(0xFF) << (i % 8 * 8);
    }
  }
  // At least 16 bytes from p must be readable.
  bool matches(const char* p) const noexcept {
    uint64_t a, b;
    std::memcpy(&a, p, 8);
    std::memcpy(&b, p + 8, 8);
    return ((a & lowMask) == low) & ((b & highMask) == high);
  }
};

struct Opening {
  TagWords words;  // after the "<"
  Tag tag;
  bool empty;  // "<tag/>"
};

// Grouped by first letter.
inline constexpr Opening kOpenings[] = {
    {TagWords("array>"), Tag::Array, false},     {TagWords("array/>"), Tag::Array, true},
    {TagWords("data>"), Tag::Data, false},       {TagWords("data/>"), Tag::Data, true},
    {TagWords("date>"), Tag::Date, false},       {TagWords("dict>"), Tag::Dict, false},
    {TagWords("dict/>"), Tag::Dict, true},       {TagWords("false/>"), Tag::False, true},
    {TagWords("integer>"), Tag::Integer, false}, {TagWords("key>"), Tag::Key, false},
    {TagWords("real>"), Tag::Real, false},       {TagWords("string>"), Tag::String, false},
    {TagWords("string/>"), Tag::String, true},   {TagWords("true/>"), Tag::True, true},
};

// Where the openings of each first letter 'a' to 'z' begin; the next letter's
// entry is where they end.
struct OpeningIndex {
  uint8_t begin[27] = {};
  constexpr OpeningIndex() {
    size_t n = sizeof kOpenings / sizeof kOpenings[0];
    for (int letter = 0; letter <= 26; ++letter) {
      size_t i = 0;
      while (i < n && uint64_t(kOpenings[i].words.low & 0xFF) < uint64_t('a' + letter)) ++i;
      begin[letter] = uint8_t(i);
    }
  }
};
inline constexpr OpeningIndex kOpeningIndex;

// The usual start tag at p (after its "<"), or null. At least 16 bytes from p
// must be readable.
inline const Opening* findOpening(const char* p) noexcept {
  unsigned letter = static_cast<unsigned char>(*p) - unsigned('a');
  if (letter >= 26) return nullptr;
  for (unsigned i = kOpeningIndex.begin[letter]; i < kOpeningIndex.begin[letter + 1]; ++i)
    if (kOpenings[i].words.matches(p)) return &kOpenings[i];
  return nullptr;
}

// The end tag of each tag, after its "<", without white space.
inline constexpr TagWords kClosings[] = {
    TagWords(""),       TagWords("/plist>"),  TagWords("/dict>"),    TagWords("/array>"),
    TagWords("/key>"),  TagWords("/string>"), TagWords("/integer>"), TagWords("/real>"),
    TagWords("/true>"), TagWords("/false>"),  TagWords("/data>"),    TagWords("/date>"),
};

}  // namespace qr::xmlplist
