// Stricter than value equality, for round-trip checks: an integer never
// matches a real, signedness must agree, and a NaN matches a NaN.
#pragma once

#include <cmath>

#include "values/array.h"
#include "values/dictionary.h"
#include "values/number.h"

namespace qrtest {

inline bool identical(const qr::Object* a, const qr::Object* b) {
  if (!a || !b) return a == b;
  if (a->kind() != b->kind()) return false;
  switch (a->kind()) {
    case qr::TypeKind::Number: {
      const auto& x = static_cast<const qr::Number&>(*a);
      const auto& y = static_cast<const qr::Number&>(*b);
      if (x.isReal() != y.isReal() || x.isUnsigned() != y.isUnsigned()) return false;
      if (!x.isReal()) return x.uint64Value() == y.uint64Value();
      double p = x.doubleValue(), q = y.doubleValue();
      return (std::isnan(p) && std::isnan(q)) || (p == q && std::signbit(p) == std::signbit(q));
    }
    case qr::TypeKind::Array: {
      const auto& x = static_cast<const qr::Array&>(*a);
      const auto& y = static_cast<const qr::Array&>(*b);
      if (x.count() != y.count()) return false;
      for (size_t i = 0; i < x.count(); ++i)
        if (!identical(x.at(i), y.at(i))) return false;
      return true;
    }
    case qr::TypeKind::Dictionary: {
      const auto& x = static_cast<const qr::Dictionary&>(*a);
      const auto& y = static_cast<const qr::Dictionary&>(*b);
      if (x.count() != y.count()) return false;
      bool same = true;
      x.forEach([&](const qr::Object& k, const qr::Object& v) {
        same = same && identical(&v, y.get(k));
      });
      return same;
    }
    default:
      return a->isEqual(*b);
  }
}

}  // namespace qrtest
