// Integer and real numbers. Unsigned 64-bit values above INT64_MAX keep their
// value so that property lists written elsewhere round-trip.
#pragma once

#include <cstdint>

#include "values/object.h"

namespace qr {

class Number final : public Object {
 public:
  static Ref<Number> integer(int64_t value);
  static Ref<Number> unsignedInteger(uint64_t value);
  static Ref<Number> real(double value);

  bool isReal() const noexcept { return type_ == Type::Real; }
  bool isUnsigned() const noexcept { return type_ == Type::Unsigned; }
  // The integer value, truncated for reals and wrapped for large unsigned values.
  int64_t int64Value() const noexcept;
  uint64_t uint64Value() const noexcept;
  double doubleValue() const noexcept;

  TypeKind kind() const noexcept override { return TypeKind::Number; }
  bool isEqual(const Object& other) const noexcept override;
  size_t hash() const noexcept override;
  std::string description() const override;

 private:
  enum class Type : uint8_t { Signed, Unsigned, Real };
  Number(Type type, uint64_t bits) : type_(type), bits_(bits) {}

  Type type_;
  uint64_t bits_;
};

template <>
inline constexpr TypeKind kExactKind<Number> = TypeKind::Number;

}  // namespace qr
