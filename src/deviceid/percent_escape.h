// Percent escaping of text for use inside a URL.
#pragma once

#include <optional>
#include <string>

#include "deviceid/text_encoding.h"

namespace qr {

class String;

// Escapes every character that RFC 2396 does not allow in a URL (anything but
// its unreserved and reserved characters) and in addition the twelve
// characters @ ? & + , ; = / ( ) : and backslash, each as "%XX" (upper-case
// hexadecimal) per byte of the character in the given encoding. None when the
// text cannot be written in the encoding (a lone surrogate never can) or the
// encoding is unknown.
std::optional<std::string> percentEscape(const String& text, TextEncoding encoding);
// The same with any encoding ICU has a converter for, by name.
std::optional<std::string> percentEscape(const String& text, const char* icuConverterName);

// Whether ICU has a converter of that name.
bool isKnownConverterName(const char* icuConverterName);

}  // namespace qr
