#include "deviceid/percent_escape.h"

#include <unicode/ucnv.h>

#include <memory>
#include <string_view>

#include "values/string.h"

namespace qr {
namespace {

// RFC 2396's unreserved and reserved characters, less the twelve that are
// escaped although a URL may carry most of them.
constexpr bool isLeftUnescaped(char16_t c) noexcept {
  if ((c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9')) return true;
  switch (c) {
    case '-':
    case '_':
    case '.':
    case '!':
    case '~':
    case '*':
    case '\'':
    case '$':
      return true;
    default:
      return false;
  }
}

void appendEscapedByte(std::string& out, unsigned char byte) {
  static constexpr char kHex[] = "0123456789ABCDEF";
  out += '%';
  out += kHex[byte >> 4];
  out += kHex[byte & 15];
}

struct ConverterCloser {
  void operator()(UConverter* c) const noexcept { ucnv_close(c); }
};
using Converter = std::unique_ptr<UConverter, ConverterCloser>;

Converter openConverter(const char* name) {
  if (!name) return nullptr;
  UErrorCode status = U_ZERO_ERROR;
  Converter c(ucnv_open(name, &status));
  if (U_FAILURE(status)) return nullptr;
  // A character the encoding lacks is a failure, never a substitute byte.
  ucnv_setFromUCallBack(c.get(), UCNV_FROM_U_CALLBACK_STOP, nullptr, nullptr, nullptr, &status);
  if (U_FAILURE(status)) return nullptr;
  return c;
}

// Writes a run of characters that need escaping; false when the encoding
// cannot hold them.
bool appendEscapedRun(std::string& out, UConverter* converter, std::u16string_view run) {
  if (run.empty()) return true;
  auto length = static_cast<int32_t>(run.size());
  std::string bytes(
      static_cast<size_t>(UCNV_GET_MAX_BYTES_FOR_STRING(length, ucnv_getMaxCharSize(converter))),
      '\0');
  UErrorCode status = U_ZERO_ERROR;
  int32_t written = ucnv_fromUChars(converter, bytes.data(), static_cast<int32_t>(bytes.size()),
                                    run.data(), length, &status);
  if (U_FAILURE(status) && status != U_STRING_NOT_TERMINATED_WARNING) return false;
  for (int32_t i = 0; i < written; ++i)
    appendEscapedByte(out, static_cast<unsigned char>(bytes[i]));
  return true;
}

std::optional<std::string> escapeWithConverter(const String& text, UConverter* converter) {
  std::u16string units = text.utf16();
  if (units.size() > static_cast<size_t>(INT32_MAX / 8)) return std::nullopt;
  std::string out;
  out.reserve(units.size() * 3);
  size_t runStart = 0;
  for (size_t i = 0; i < units.size(); ++i) {
    if (!isLeftUnescaped(units[i])) continue;
    if (!appendEscapedRun(out, converter,
                          std::u16string_view(units).substr(runStart, i - runStart)))
      return std::nullopt;
    out += static_cast<char>(units[i]);
    runStart = i + 1;
  }
  if (!appendEscapedRun(out, converter, std::u16string_view(units).substr(runStart)))
    return std::nullopt;
  return out;
}

}  // namespace

std::optional<std::string> percentEscape(const String& text, TextEncoding encoding) {
  const char* name = icuConverterName(encoding);
  if (!name) return std::nullopt;
  if (text.isNarrow() && isASCIICompatible(encoding)) {
    // ASCII text in an encoding that keeps ASCII: each character is its own byte.
    std::string out;
    out.reserve(text.length() * 3);
    for (char c : text.narrow()) {
      if (isLeftUnescaped(static_cast<unsigned char>(c)))
        out += c;
      else
        appendEscapedByte(out, static_cast<unsigned char>(c));
    }
    return out;
  }
  return percentEscape(text, name);
}

std::optional<std::string> percentEscape(const String& text, const char* icuConverterName) {
  Converter converter = openConverter(icuConverterName);
  if (!converter) return std::nullopt;
  return escapeWithConverter(text, converter.get());
}

bool isKnownConverterName(const char* icuConverterName) {
  return openConverter(icuConverterName) != nullptr;
}

}  // namespace qr
