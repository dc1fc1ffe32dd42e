// The two boolean values; each exists once for the life of the process.
#pragma once

#include "values/object.h"

namespace qr {

class Boolean final : public Object {
 public:
  static Ref<Boolean> trueValue();
  static Ref<Boolean> falseValue();
  static Ref<Boolean> of(bool value) { return value ? trueValue() : falseValue(); }

  bool value() const noexcept { return value_; }

  TypeKind kind() const noexcept override { return TypeKind::Boolean; }
  bool isEqual(const Object& other) const noexcept override { return this == &other; }
  size_t hash() const noexcept override { return value_ ? 1 : 2; }
  std::string description() const override { return value_ ? "true" : "false"; }

 private:
  explicit Boolean(bool value) : value_(value) {}
  bool value_;
};

template <>
inline constexpr TypeKind kExactKind<Boolean> = TypeKind::Boolean;

}  // namespace qr
