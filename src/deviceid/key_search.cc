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

}  // namespace

template <class C>
std::optional<View<C>> searchKeys(View<C> text, std::span<const FoldedKey* const> keys,
                                  KeySearchMode mode) {
  if (text.empty() || keys.empty()) return std::nullopt;
  size_t start = 0;
  for (;;) {
    size_t stop = text.find(static_cast<C>(';'), start);
    View<C> component = text.substr(start, stop == View<C>::npos ? View<C>::npos : stop - start);
    size_t blanks = 0;
    while (blanks < component.size() && isBlank(component[blanks])) ++blanks;
    for (const FoldedKey* key : keys) {
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
