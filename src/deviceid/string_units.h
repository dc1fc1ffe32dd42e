// Moving between string values and the code-unit views the device ID rules
// work on: char views of narrow (ASCII) strings, char16_t views of wide ones.
#pragma once

#include <optional>

#include "deviceid/unicode_text.h"
#include "values/string.h"

namespace qr::deviceid {

// Runs f over the string's code units in whichever width they are stored.
template <class F>
auto withUnits(const String& text, F&& f) {
  return text.isNarrow() ? f(text.narrow()) : f(text.wide());
}

// Narrow views hold ASCII, which is its own UTF-8.
inline Ref<String> toString(View<char> units) { return String::fromUTF8(units); }
inline Ref<String> toString(View<char16_t> units) { return String::fromUTF16(units); }
template <class C>
Ref<String> toString(const std::optional<View<C>>& units) {
  return units ? toString(*units) : nullptr;
}

inline Ref<MutableString> toMutableString(View<char> units) {
  auto out = qr::make<MutableString>();
  out->appendUTF8(units);
  return out;
}
inline Ref<MutableString> toMutableString(View<char16_t> units) {
  auto out = qr::make<MutableString>();
  out->append(units);
  return out;
}

}  // namespace qr::deviceid
