#include "deviceid/unicode_text.h"

#include <unicode/uchar.h>
#include <unicode/ustring.h>

#include <limits>
#include <stdexcept>

namespace qr::deviceid {

bool isUnicodeBlank(char16_t unit) noexcept { return u_isblank(unit); }

bool isUnicodeBlankOrNewline(char16_t unit) noexcept {
  switch (unit) {
    case 0x0A:
    case 0x0B:
    case 0x0C:
    case 0x0D:
    case 0x85:
    case 0x2028:
    case 0x2029:
      return true;
    default:
      return u_isblank(unit);
  }
}

char32_t unicodeFold(char32_t codePoint) noexcept {
  return static_cast<char32_t>(u_foldCase(static_cast<UChar32>(codePoint), U_FOLD_CASE_DEFAULT));
}

std::u16string unicodeLowercase(std::u16string_view units) {
  if (units.size() > static_cast<size_t>(std::numeric_limits<int32_t>::max() / 4))
    throw std::length_error("text too long to lower-case");
  auto length = static_cast<int32_t>(units.size());
  // Lower-casing grows text by at most a few units per code point; start with
  // room for the common case and let ICU say when more is needed.
  std::u16string out(units.size() + 8, u'\0');
  for (int attempt = 0; attempt < 2; ++attempt) {
    UErrorCode status = U_ZERO_ERROR;
    int32_t needed = u_strToLower(out.data(), static_cast<int32_t>(out.size()), units.data(),
                                  length, "", &status);
    if (U_SUCCESS(status) || status == U_STRING_NOT_TERMINATED_WARNING) {
      out.resize(static_cast<size_t>(needed));
      return out;
    }
    if (status != U_BUFFER_OVERFLOW_ERROR) break;
    out.assign(static_cast<size_t>(needed), u'\0');
  }
  // Lower-casing cannot fail on well-sized buffers; keep the text unchanged if it does.
  return std::u16string(units);
}

template <>
Buffer<char> lowercase<char>(View<char> text) {
  Buffer<char> out(text);
  for (char& c : out) c = static_cast<char>(asciiLower(static_cast<unsigned char>(c)));
  return out;
}

template <>
Buffer<char16_t> lowercase<char16_t>(View<char16_t> text) {
  for (char16_t u : text)
    if (u >= 0x80) return unicodeLowercase(text);
  Buffer<char16_t> out(text);
  for (char16_t& u : out) u = static_cast<char16_t>(asciiLower(u));
  return out;
}

}  // namespace qr::deviceid
