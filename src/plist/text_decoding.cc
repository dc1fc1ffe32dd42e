#include "plist/text_decoding.h"

#include "values/string.h"

namespace qr {

bool decodePropertyListText(std::string_view bytes, std::u16string& out) {
  out.clear();
  bool little = bytes.starts_with("\xFF\xFE");
  if (little || bytes.starts_with("\xFE\xFF")) {
    bytes.remove_prefix(2);
    if (bytes.size() % 2) return false;
    out.resize(bytes.size() / 2);
    const auto* p = reinterpret_cast<const unsigned char*>(bytes.data());
    for (size_t i = 0; i < out.size(); ++i, p += 2)
      out[i] = little ? static_cast<char16_t>(p[0] | p[1] << 8)
                      : static_cast<char16_t>(p[0] << 8 | p[1]);
    return true;
  }
  if (bytes.starts_with("\xEF\xBB\xBF")) bytes.remove_prefix(3);
  return decodeUTF8(bytes, out);
}

}  // namespace qr
