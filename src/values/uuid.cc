#include "values/uuid.h"

#include <cstring>

namespace qr {
namespace {
int hexValue(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}
}  // namespace

Ref<UUID> UUID::fromString(std::string_view text) {
  if (text.size() != 36) return nullptr;
  Bytes bytes{};
  size_t b = 0;
  for (size_t i = 0; i < text.size();) {
    if (i == 8 || i == 13 || i == 18 || i == 23) {
      if (text[i] != '-') return nullptr;
      ++i;
      continue;
    }
    int hi = hexValue(text[i]), lo = hexValue(text[i + 1]);
    if (hi < 0 || lo < 0) return nullptr;
    bytes[b++] = static_cast<uint8_t>(hi << 4 | lo);
    i += 2;
  }
  return qr::make<UUID>(bytes);
}

std::string UUID::string() const {
  static const char hex[] = "0123456789ABCDEF";
  std::string out;
  out.reserve(36);
  for (size_t i = 0; i < bytes_.size(); ++i) {
    if (i == 4 || i == 6 || i == 8 || i == 10) out += '-';
    out += hex[bytes_[i] >> 4];
    out += hex[bytes_[i] & 15];
  }
  return out;
}

bool UUID::isEqual(const Object& other) const noexcept {
  if (this == &other) return true;
  return other.kind() == TypeKind::UUID && static_cast<const UUID&>(other).bytes_ == bytes_;
}

size_t UUID::hash() const noexcept {
  uint64_t a, b;
  std::memcpy(&a, bytes_.data(), 8);
  std::memcpy(&b, bytes_.data() + 8, 8);
  return static_cast<size_t>(a ^ (b * 0x9E3779B97F4A7C15ull));
}

}  // namespace qr
