#include "plist/xml_leaf_text.h"

#include <locale.h>
#include <stdlib.h>

#include <charconv>
#include <cmath>
#include <cstring>
#include <string>

namespace qr::xmlplist {
namespace {

bool isXMLSpace(char c) noexcept { return c == ' ' || c == '\t' || c == '\n' || c == '\r'; }

int hexDigit(char c) noexcept {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

// from_chars gives no value for text beyond the range of a double; strtod
// in the C locale rounds it to infinity or zero as other readers do.
double parseOutOfRange(std::string_view text) {
  static locale_t c = newlocale(LC_ALL_MASK, "C", nullptr);
  std::string copy(text);
  return strtod_l(copy.c_str(), nullptr, c);
}

constexpr char kBase64Alphabet[] =
    "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";

struct Base64Table {
  int8_t value[256];
  constexpr Base64Table() : value() {
    for (int i = 0; i < 256; ++i) value[i] = -1;
    for (int i = 0; i < 64; ++i) value[static_cast<unsigned char>(kBase64Alphabet[i])] = int8_t(i);
  }
};
constexpr Base64Table kBase64;

}  // namespace

std::string_view trimXMLSpace(std::string_view text) noexcept {
  while (!text.empty() && isXMLSpace(text.front())) text.remove_prefix(1);
  while (!text.empty() && isXMLSpace(text.back())) text.remove_suffix(1);
  return text;
}

Ref<Number> parseInteger(std::string_view text) {
  text = trimXMLSpace(text);
  bool negative = false;
  if (!text.empty() && (text[0] == '-' || text[0] == '+')) {
    negative = text[0] == '-';
    text.remove_prefix(1);
  }
  unsigned base = 10;
  if (text.size() > 2 && text[0] == '0' && (text[1] == 'x' || text[1] == 'X')) {
    base = 16;
    text.remove_prefix(2);
  }
  if (text.empty()) return nullptr;
  uint64_t magnitude = 0;
  for (char c : text) {
    int digit = base == 16 ? hexDigit(c) : (c >= '0' && c <= '9' ? c - '0' : -1);
    if (digit < 0) return nullptr;
    if (magnitude > (UINT64_MAX - static_cast<unsigned>(digit)) / base) return nullptr;
    magnitude = magnitude * base + static_cast<unsigned>(digit);
  }
  if (!negative) return Number::unsignedInteger(magnitude);
  if (magnitude > uint64_t(INT64_MAX) + 1) return nullptr;
  // Negating in unsigned arithmetic reaches INT64_MIN without overflow.
  return Number::integer(static_cast<int64_t>(0 - magnitude));
}

Ref<Number> parseReal(std::string_view text) {
  text = trimXMLSpace(text);
  std::string_view body = text;
  // from_chars takes a minus sign but not a plus sign.
  if (!body.empty() && body[0] == '+') {
    body.remove_prefix(1);
    if (body.empty() || body[0] == '-' || body[0] == '+') return nullptr;
  }
  if (body.empty()) return nullptr;
  double value = 0;
  auto [end, error] = std::from_chars(body.data(), body.data() + body.size(), value);
  if (end != body.data() + body.size()) return nullptr;
  if (error == std::errc::result_out_of_range)
    value = parseOutOfRange(body);
  else if (error != std::errc())
    return nullptr;
  return Number::real(value);
}

bool decodeBase64(std::string_view text, std::vector<uint8_t>& out) {
  out.clear();
  out.reserve(text.size() / 4 * 3 + 3);
  uint32_t group = 0;
  int have = 0;
  size_t padding = 0;
  for (char c : text) {
    if (isXMLSpace(c)) continue;
    if (c == '=') {
      ++padding;
      continue;
    }
    int v = kBase64.value[static_cast<unsigned char>(c)];
    if (v < 0 || padding) return false;  // nothing but padding and space after padding
    group = (group << 6) | static_cast<uint32_t>(v);
    if (++have == 4) {
      out.push_back(static_cast<uint8_t>(group >> 16));
      out.push_back(static_cast<uint8_t>(group >> 8));
      out.push_back(static_cast<uint8_t>(group));
      group = 0;
      have = 0;
    }
  }
  // A final group of two or three characters carries one or two bytes; the
  // padding, when present, must complete it.
  switch (have) {
    case 0:
      return padding == 0;
    case 2:
      if (padding != 0 && padding != 2) return false;
      out.push_back(static_cast<uint8_t>(group >> 4));
      return true;
    case 3:
      if (padding > 1) return false;
      out.push_back(static_cast<uint8_t>(group >> 10));
      out.push_back(static_cast<uint8_t>(group >> 2));
      return true;
    default:
      return false;
  }
}

char* encodeBase64(const uint8_t* bytes, size_t n, char* out) noexcept {
  size_t i = 0;
  for (; i + 3 <= n; i += 3) {
    uint32_t g = uint32_t(bytes[i]) << 16 | uint32_t(bytes[i + 1]) << 8 | bytes[i + 2];
    out[0] = kBase64Alphabet[g >> 18];
    out[1] = kBase64Alphabet[(g >> 12) & 63];
    out[2] = kBase64Alphabet[(g >> 6) & 63];
    out[3] = kBase64Alphabet[g & 63];
    out += 4;
  }
  if (i < n) {
    uint32_t g = uint32_t(bytes[i]) << 16;
    if (i + 1 < n) g |= uint32_t(bytes[i + 1]) << 8;
    out[0] = kBase64Alphabet[g >> 18];
    out[1] = kBase64Alphabet[(g >> 12) & 63];
    out[2] = i + 1 < n ? kBase64Alphabet[(g >> 6) & 63] : '=';
    out[3] = '=';
    out += 4;
  }
  return out;
}

char* formatReal(double value, char* out) noexcept {
  if (std::isnan(value)) {
    std::memcpy(out, "nan", 3);
    return out + 3;
  }
  if (std::isinf(value)) {
    if (value < 0) *out++ = '-';
    std::memcpy(out, "inf", 3);
    return out + 3;
  }
  return std::to_chars(out, out + kMaxRealText, value).ptr;
}

}  // namespace qr::xmlplist
