// 128-bit identifiers of plug-in types, factories and interfaces.
#pragma once

#include <array>
#include <cstdint>
#include <string>
#include <string_view>

#include "values/object.h"

namespace qr {

class UUID final : public Object {
 public:
  using Bytes = std::array<uint8_t, 16>;

  explicit UUID(const Bytes& bytes) : bytes_(bytes) {}
  // "XXXXXXXX-XXXX-XXXX-XXXX-XXXXXXXXXXXX" in either letter case; null otherwise.
  static Ref<UUID> fromString(std::string_view text);

  const Bytes& bytes() const noexcept { return bytes_; }
  // The upper-case text form.
  std::string string() const;

  TypeKind kind() const noexcept override { return TypeKind::UUID; }
  bool isEqual(const Object& other) const noexcept override;
  size_t hash() const noexcept override;
  std::string description() const override { return string(); }

 private:
  Bytes bytes_;
};

template <>
inline constexpr TypeKind kExactKind<UUID> = TypeKind::UUID;

}  // namespace qr
