#include "deviceid/text_encoding.h"

#include <array>

#include "deviceid/ascii_text.h"

namespace qr {
namespace {

struct EncodingName {
  TextEncoding encoding;
  std::string_view name;
  const char* converter;
  bool asciiCompatible;
};

constexpr std::array<EncodingName, 5> kEncodings = {{
    {TextEncoding::UTF8, "utf-8", "UTF-8", true},
    {TextEncoding::ASCII, "ascii", "US-ASCII", true},
    {TextEncoding::ISOLatin1, "iso-latin-1", "ISO-8859-1", true},
    {TextEncoding::Windows1252, "windows-1252", "windows-1252", true},
    {TextEncoding::UTF16, "utf-16", "UTF-16BE", false},
}};

const EncodingName* entryFor(TextEncoding encoding) noexcept {
  for (const EncodingName& e : kEncodings)
    if (e.encoding == encoding) return &e;
  return nullptr;
}

bool equalIgnoringASCIICase(std::string_view a, std::string_view b) noexcept {
  if (a.size() != b.size()) return false;
  for (size_t i = 0; i < a.size(); ++i)
    if (deviceid::asciiLower(static_cast<unsigned char>(a[i])) !=
        deviceid::asciiLower(static_cast<unsigned char>(b[i])))
      return false;
  return true;
}

}  // namespace

const char* icuConverterName(TextEncoding encoding) noexcept {
  const EncodingName* e = entryFor(encoding);
  return e ? e->converter : nullptr;
}

std::optional<TextEncoding> textEncodingNamed(std::string_view name) noexcept {
  for (const EncodingName& e : kEncodings)
    if (equalIgnoringASCIICase(e.name, name)) return e.encoding;
  return std::nullopt;
}

bool isASCIICompatible(TextEncoding encoding) noexcept {
  const EncodingName* e = entryFor(encoding);
  return e && e->asciiCompatible;
}

}  // namespace qr
