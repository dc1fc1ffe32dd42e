// Text encodings that callers name by number, as the percent escaping of
// device ID text takes them, and their ICU converters.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace qr {

enum class TextEncoding : uint32_t {
  UTF8 = 1,
  ASCII = 2,
  ISOLatin1 = 3,
  Windows1252 = 4,
  // Big-endian, without a byte-order mark, so every escaped character
  // carries the same bytes wherever it stands.
  UTF16 = 5,
};

// The ICU converter name for an encoding; null for a number we do not define.
const char* icuConverterName(TextEncoding encoding) noexcept;
// Our own encoding names ("utf-8", "ascii", "iso-latin-1", "windows-1252",
// "utf-16"), letter case ignored.
std::optional<TextEncoding> textEncodingNamed(std::string_view name) noexcept;
// Whether every ASCII character is one byte of the same value in it.
bool isASCIICompatible(TextEncoding encoding) noexcept;

}  // namespace qr
