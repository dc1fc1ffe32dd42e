#include "deviceid/folded_search.h"

#include "values/string.h"

namespace qr::deviceid {

FoldedKey FoldedKey::fromASCII(std::string_view ascii) {
  FoldedKey key;
  key.points.reserve(ascii.size());
  for (char c : ascii) key.points.push_back({asciiLower(static_cast<unsigned char>(c)), 1});
  key.units = ascii.size();
  key.blankAtEdge = !ascii.empty() && (isBlank(ascii.front()) || isBlank(ascii.back()));
  return key;
}

FoldedKey FoldedKey::fromUnits(std::u16string_view units) {
  FoldedKey key;
  key.points.reserve(units.size());
  for (size_t i = 0; i < units.size();) {
    uint8_t width;
    char32_t c = codePointAt(units, i, width);
    key.points.push_back({foldCodePoint(c), width});
    i += width;
  }
  key.units = units.size();
  key.blankAtEdge = !units.empty() && (isBlank(units.front()) || isBlank(units.back()));
  return key;
}

FoldedKey FoldedKey::of(const String& key) {
  return key.isNarrow() ? fromASCII(key.narrow()) : fromUnits(key.wide());
}

}  // namespace qr::deviceid
