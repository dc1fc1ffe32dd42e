#include "deviceid/key_search.h"

namespace qr::deviceid {
namespace {

// Whether the key matches this component, and where its value starts.
template <class C>
std::optional<size_t> matchInComponent(View<C> component, size_t leadingBlanks,
                                       const FoldedKey& key, KeySearchMode mode) {
  if (key.units == 0) return std::nullopt;
  if (mode == KeySearchMode::Shortcut && !key.blankAtEdge) {
    // Nothing but blanks may stand before the key, and a key that neither
    // begins nor ends with a blank cannot first occur inside those blanks.
    if (matchesAt(component, leadingBlanks, key)) return leadingBlanks + key.units;
    return std::nullopt;
  }
  size_t at = findFolded(component, key);
  if (at == View<C>::npos) return std::nullopt;
  size_t end = at + key.units;
  if (at == 0) return end;
  // Only the first occurrence counts: it matches when trimming blanks off the
  // text up to its end leaves exactly the key.
  if (trimBlank(component.substr(0, end)).size() == key.units) return end;
  return std::nullopt;
}

// For narrow text: the folded first characters of the keys that the shortcut
// tests, so that a component whose first non-blank character starts none of
// them is passed over at once. A key that goes the literal way disables it.
class FirstCharacterFilter {
 public:
  FirstCharacterFilter(std::span<const FoldedKey* const> keys, KeySearchMode mode) {
    for (const FoldedKey* key : keys) {
      if (key->units == 0) continue;
      if (mode == KeySearchMode::Literal || key->blankAtEdge) {
        active_ = false;
        return;
      }
      const FoldedKey::Point& first = key->points.front();
      if (first.width == 1 && first.folded < 128)
        bits_[first.folded >> 6] |= uint64_t{1} << (first.folded & 63);
    }
  }
  // Whether some key may match a component with these units after its blanks.
  bool admits(View<char> rest) const noexcept {
    if (!active_) return true;
    if (rest.empty()) return false;
    char32_t folded = asciiLower(static_cast<unsigned char>(rest.front()));
    return folded < 128 && ((bits_[folded >> 6] >> (folded & 63)) & 1);
  }

 private:
  uint64_t bits_[2] = {0, 0};
  bool active_ = true;
};

}  // namespace

template <class C>
std::optional<View<C>> searchKeys(View<C> text, std::span<const FoldedKey* const> keys,
                                  KeySearchMode mode) {
  if (text.empty() || keys.empty()) return std::nullopt;
  FirstCharacterFilter filter(keys, mode);
  size_t start = 0;
  for (;;) {
    size_t stop = text.find(static_cast<C>(';'), start);
    View<C> component = text.substr(start, stop == View<C>::npos ? View<C>::npos : stop - start);
    size_t blanks = 0;
    while (blanks < component.size() && isBlank(component[blanks])) ++blanks;
    bool worthTrying = true;
    if constexpr (sizeof(C) == 1) worthTrying = filter.admits(component.substr(blanks));
    if (worthTrying) {
      for (const FoldedKey* key : keys)
        if (auto valueStart = matchInComponent(component, blanks, *key, mode))
          return component.substr(*valueStart);
    }
    if (stop == View<C>::npos) return std::nullopt;
    start = stop + 1;
  }
}

template std::optional<View<char>> searchKeys(View<char>, std::span<const FoldedKey* const>,
                                              KeySearchMode);
template std::optional<View<char16_t>> searchKeys(View<char16_t>, std::span<const FoldedKey* const>,
                                                  KeySearchMode);

}  // namespace qr::deviceid
