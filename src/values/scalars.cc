// Numbers, booleans, data and dates: the leaf values.
#include <cinttypes>
#include <cmath>
#include <cstdio>
#include <cstring>
#include <ctime>

#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/number.h"

namespace qr {

Ref<Number> Number::integer(int64_t value) {
  return Ref<Number>::adopt(new Number(Type::Signed, static_cast<uint64_t>(value)));
}

Ref<Number> Number::unsignedInteger(uint64_t value) {
  if (value <= static_cast<uint64_t>(INT64_MAX)) return integer(static_cast<int64_t>(value));
  return Ref<Number>::adopt(new Number(Type::Unsigned, value));
}

Ref<Number> Number::real(double value) {
  uint64_t bits;
  std::memcpy(&bits, &value, sizeof bits);
  return Ref<Number>::adopt(new Number(Type::Real, bits));
}

int64_t Number::int64Value() const noexcept {
  if (type_ != Type::Real) return static_cast<int64_t>(bits_);
  double d = doubleValue();
  if (std::isnan(d)) return 0;
  if (d >= 9223372036854775807.0) return INT64_MAX;
  if (d <= -9223372036854775808.0) return INT64_MIN;
  return static_cast<int64_t>(d);
}

uint64_t Number::uint64Value() const noexcept {
  if (type_ != Type::Real) return bits_;
  return static_cast<uint64_t>(int64Value());
}

double Number::doubleValue() const noexcept {
  switch (type_) {
    case Type::Signed:
      return static_cast<double>(static_cast<int64_t>(bits_));
    case Type::Unsigned:
      return static_cast<double>(bits_);
    case Type::Real:
      break;
  }
  double d;
  std::memcpy(&d, &bits_, sizeof d);
  return d;
}

bool Number::isEqual(const Object& other) const noexcept {
  if (this == &other) return true;
  if (other.kind() != TypeKind::Number) return false;
  const auto& o = static_cast<const Number&>(other);
  if (type_ != Type::Real && o.type_ != Type::Real) return type_ == o.type_ && bits_ == o.bits_;
  // A real equals an integer of the same value, as the values compare in arithmetic.
  if (type_ == Type::Real && o.type_ == Type::Real) return doubleValue() == o.doubleValue();
  const Number& r = type_ == Type::Real ? *this : o;
  const Number& i = type_ == Type::Real ? o : *this;
  double d = r.doubleValue();
  if (std::trunc(d) != d) return false;
  if (i.type_ == Type::Unsigned)
    return d >= 9223372036854775808.0 && d < 18446744073709551616.0 &&
           static_cast<uint64_t>(d) == i.bits_;
  return d >= -9223372036854775808.0 && d < 9223372036854775808.0 &&
         static_cast<int64_t>(d) == static_cast<int64_t>(i.bits_);
}

size_t Number::hash() const noexcept {
  double d = doubleValue();
  if (type_ != Type::Real) return static_cast<size_t>(bits_ * 0x9E3779B97F4A7C15ull);
  // Reals with an integral value hash like the integer they equal.
  if (std::trunc(d) == d && d >= -9223372036854775808.0 && d < 9223372036854775808.0)
    return static_cast<size_t>(static_cast<uint64_t>(static_cast<int64_t>(d)) *
                               0x9E3779B97F4A7C15ull);
  return std::hash<double>{}(d);
}

std::string Number::description() const {
  char buf[64];
  switch (type_) {
    case Type::Signed:
      std::snprintf(buf, sizeof buf, "%" PRId64, static_cast<int64_t>(bits_));
      break;
    case Type::Unsigned:
      std::snprintf(buf, sizeof buf, "%" PRIu64, bits_);
      break;
    case Type::Real:
      std::snprintf(buf, sizeof buf, "%.17g", doubleValue());
      break;
  }
  return buf;
}

Ref<Boolean> Boolean::trueValue() {
  static Boolean* const value = immortal(new Boolean(true));
  return Ref<Boolean>(value);
}

Ref<Boolean> Boolean::falseValue() {
  static Boolean* const value = immortal(new Boolean(false));
  return Ref<Boolean>(value);
}

bool Data::isEqual(const Object& other) const noexcept {
  if (this == &other) return true;
  if (other.kind() != TypeKind::Data) return false;
  return bytes_ == static_cast<const Data&>(other).bytes_;
}

size_t Data::hash() const noexcept {
  uint64_t h = 1469598103934665603ull ^ bytes_.size();
  size_t n = std::min<size_t>(bytes_.size(), 80);  // a bounded prefix is enough to spread
  for (size_t i = 0; i < n; ++i) h = (h ^ bytes_[i]) * 1099511628211ull;
  return static_cast<size_t>(h);
}

std::string Data::description() const {
  static const char hex[] = "0123456789abcdef";
  std::string out = "<";
  for (size_t i = 0; i < bytes_.size(); ++i) {
    if (i && i % 4 == 0) out += ' ';
    out += hex[bytes_[i] >> 4];
    out += hex[bytes_[i] & 15];
  }
  return out + ">";
}

namespace {

int64_t daysFromCivil(int64_t y, unsigned m, unsigned d) {
  y -= m <= 2;
  const int64_t era = (y >= 0 ? y : y - 399) / 400;
  const unsigned yoe = static_cast<unsigned>(y - era * 400);
  const unsigned doy = (153 * (m > 2 ? m - 3 : m + 9) + 2) / 5 + d - 1;
  const unsigned doe = yoe * 365 + yoe / 4 - yoe / 100 + doy;
  return era * 146097 + static_cast<int64_t>(doe) - 719468;
}

void civilFromDays(int64_t z, int64_t& y, unsigned& m, unsigned& d) {
  z += 719468;
  const int64_t era = (z >= 0 ? z : z - 146096) / 146097;
  const unsigned doe = static_cast<unsigned>(z - era * 146097);
  const unsigned yoe = (doe - doe / 1460 + doe / 36524 - doe / 146096) / 365;
  y = static_cast<int64_t>(yoe) + era * 400;
  const unsigned doy = doe - (365 * yoe + yoe / 4 - yoe / 100);
  const unsigned mp = (5 * doy + 2) / 153;
  d = doy - (153 * mp + 2) / 5 + 1;
  m = mp < 10 ? mp + 3 : mp - 9;
  y += m <= 2;
}

bool digits(std::string_view s, size_t pos, size_t n, int& out) {
  out = 0;
  for (size_t i = pos; i < pos + n; ++i) {
    if (s[i] < '0' || s[i] > '9') return false;
    out = out * 10 + (s[i] - '0');
  }
  return true;
}

}  // namespace

Ref<Date> Date::fromISO8601(std::string_view s) {
  if (s.size() != 20 || s[4] != '-' || s[7] != '-' || s[10] != 'T' || s[13] != ':' ||
      s[16] != ':' || s[19] != 'Z')
    return nullptr;
  int y, mo, d, h, mi, se;
  if (!digits(s, 0, 4, y) || !digits(s, 5, 2, mo) || !digits(s, 8, 2, d) || !digits(s, 11, 2, h) ||
      !digits(s, 14, 2, mi) || !digits(s, 17, 2, se))
    return nullptr;
  static const int kDays[] = {31, 29, 31, 30, 31, 30, 31, 31, 30, 31, 30, 31};
  if (mo < 1 || mo > 12 || d < 1 || d > kDays[mo - 1] || h > 23 || mi > 59 || se > 60)
    return nullptr;
  bool leap = (y % 4 == 0 && y % 100 != 0) || y % 400 == 0;
  if (mo == 2 && d == 29 && !leap) return nullptr;
  int64_t days = daysFromCivil(y, static_cast<unsigned>(mo), static_cast<unsigned>(d));
  double unix = static_cast<double>(days * 86400 + h * 3600 + mi * 60 + se);
  return fromUnixTime(unix);
}

std::string Date::iso8601() const {
  double u = std::floor(unixTime());
  if (!std::isfinite(u) || std::fabs(u) > 1e15) u = 0;
  auto secs = static_cast<int64_t>(u);
  int64_t days = secs >= 0 ? secs / 86400 : -((-secs + 86399) / 86400);
  int64_t rem = secs - days * 86400;
  int64_t y;
  unsigned m, d;
  civilFromDays(days, y, m, d);
  char buf[48];
  std::snprintf(buf, sizeof buf, "%04" PRId64 "-%02u-%02uT%02d:%02d:%02dZ", y, m, d,
                static_cast<int>(rem / 3600), static_cast<int>(rem / 60 % 60),
                static_cast<int>(rem % 60));
  return buf;
}

bool Date::isEqual(const Object& other) const noexcept {
  if (this == &other) return true;
  if (other.kind() != TypeKind::Date) return false;
  return seconds_ == static_cast<const Date&>(other).seconds_;
}

size_t Date::hash() const noexcept { return std::hash<double>{}(seconds_); }

}  // namespace qr
