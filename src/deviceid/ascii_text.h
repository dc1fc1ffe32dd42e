// The ASCII answers to the character questions the device ID rules ask.
// Narrow strings hold only ASCII, so they never need more than these; wide
// strings use them for their ASCII units before asking ICU.
#pragma once

namespace qr::deviceid {

constexpr char32_t asciiLower(char32_t c) noexcept { return c >= 'A' && c <= 'Z' ? c + 32 : c; }

// Space and tab: the only ASCII members of the Unicode space separators plus tab.
constexpr bool isASCIIBlank(char32_t c) noexcept { return c == ' ' || c == '\t'; }

// Space, tab, line feed, vertical tab, form feed and carriage return.
constexpr bool isASCIIBlankOrNewline(char32_t c) noexcept {
  return c == ' ' || (c >= '\t' && c <= '\r');
}

}  // namespace qr::deviceid
