// The device ID key search: the value after the first key found in the first
// component (of the ";"-separated text) that carries any of the keys.
#pragma once

#include <optional>
#include <span>

#include "deviceid/folded_search.h"

namespace qr::deviceid {

enum class KeySearchMode {
  // A key without blanks at its ends matches a component exactly when it
  // stands right after the component's leading blanks; test just there.
  Shortcut,
  // Find the key's first occurrence in each component and trim to decide, for
  // every key. Gives the same answers; kept to check the shortcut against.
  Literal,
};

// The value (a view into text) after the matching key, untrimmed; none when no
// component matches, the text is empty or there are no keys.
template <class C>
std::optional<View<C>> searchKeys(View<C> text, std::span<const FoldedKey* const> keys,
                                  KeySearchMode mode = KeySearchMode::Shortcut);

extern template std::optional<View<char>> searchKeys(View<char>, std::span<const FoldedKey* const>,
                                                     KeySearchMode);
extern template std::optional<View<char16_t>> searchKeys(View<char16_t>,
                                                         std::span<const FoldedKey* const>,
                                                         KeySearchMode);

}  // namespace qr::deviceid
