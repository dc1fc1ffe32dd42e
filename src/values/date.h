// Points in time, as seconds since 2001-01-01T00:00:00Z (the property-list epoch).
#pragma once

#include <optional>
#include <string>
#include <string_view>

#include "values/object.h"

namespace qr {

class Date final : public Object {
 public:
  static constexpr double kUnixEpochOffset = 978307200.0;

  explicit Date(double secondsSinceReference) : seconds_(secondsSinceReference) {}
  static Ref<Date> fromUnixTime(double unixSeconds) {
    return qr::make<Date>(unixSeconds - kUnixEpochOffset);
  }
  // "YYYY-MM-DDTHH:MM:SSZ"; null for anything else or an impossible date.
  static Ref<Date> fromISO8601(std::string_view text);

  double secondsSinceReference() const noexcept { return seconds_; }
  double unixTime() const noexcept { return seconds_ + kUnixEpochOffset; }
  // "YYYY-MM-DDTHH:MM:SSZ", whole seconds rounded down.
  std::string iso8601() const;

  TypeKind kind() const noexcept override { return TypeKind::Date; }
  bool isEqual(const Object& other) const noexcept override;
  size_t hash() const noexcept override;
  std::string description() const override { return iso8601(); }

 private:
  double seconds_;
};

template <>
inline constexpr TypeKind kExactKind<Date> = TypeKind::Date;

}  // namespace qr
