// Turns the bytes of a text-format property list into UTF-16 code units.
#pragma once

#include <string>
#include <string_view>

namespace qr {

// UTF-16 little- or big-endian when the bytes open with its byte-order mark,
// otherwise UTF-8 (a UTF-8 byte-order mark is dropped). False for an odd
// number of UTF-16 bytes or ill-formed UTF-8, encoded surrogates included.
bool decodePropertyListText(std::string_view bytes, std::u16string& out);

}  // namespace qr
