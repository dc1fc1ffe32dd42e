// The text forms of the leaf values inside an XML property list: integers,
// reals and base64 data, read leniently where other writers differ and
// written in one fixed form.
#pragma once

#include <cstddef>
#include <cstdint>
#include <string_view>
#include <vector>

#include "values/number.h"

namespace qr::xmlplist {

// Drops the XML white space (space, tab, line feed, carriage return) at both ends.
std::string_view trimXMLSpace(std::string_view text) noexcept;

// Decimal with an optional sign, or hexadecimal after "0x"; values above
// INT64_MAX up to UINT64_MAX become unsigned numbers. Null when malformed or
// out of range.
Ref<Number> parseInteger(std::string_view text);
// Decimal or exponent notation, and the nan / inf / infinity spellings with
// an optional sign. Null when malformed.
Ref<Number> parseReal(std::string_view text);

// Base64 with white space anywhere and optional final padding. False when
// anything else appears.
bool decodeBase64(std::string_view text, std::vector<uint8_t>& out);

constexpr size_t kBase64LineLength = 68;  // characters; a multiple of four
// Base64 of bytes, with no line breaks; writes base64Length(n) characters.
constexpr size_t base64Length(size_t bytes) noexcept { return (bytes + 2) / 3 * 4; }
char* encodeBase64(const uint8_t* bytes, size_t n, char* out) noexcept;

// The shortest text that reads back to the same double; at most 32 characters.
constexpr size_t kMaxRealText = 32;
char* formatReal(double value, char* out) noexcept;

}  // namespace qr::xmlplist
