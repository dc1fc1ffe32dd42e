// Stricter than value equality, for round-trip checks: an integer never
// matches a real, signedness and the sign of zero must agree, and a NaN
// matches a NaN. Given a mutability, also that a's containers are mutable
// exactly when it asks, its strings and data likewise, and its keys never.
// Also short builders for expected values.
#pragma once

#include <cmath>

#include "values/array.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/deep_copy.h"
#include "values/dictionary.h"
#include "values/number.h"
#include "values/string.h"

namespace qrtest {
using namespace qr;

inline bool identical(const Object* a, const Object* b, const Mutability* m = nullptr) {
  if (!a || !b || a->kind() != b->kind()) return a == b;
  bool container = cast<Array>(a) || cast<Dictionary>(a), leaf = cast<String>(a) || cast<Data>(a);
  bool isMutable = cast<MutableArray>(a) || cast<MutableDictionary>(a) || cast<MutableString>(a) ||
                   cast<MutableData>(a);
  if (m && isMutable != (container ? *m != Mutability::Immutable
                                   : leaf && *m == Mutability::MutableContainersAndLeaves))
    return false;
  if (auto* x = cast<Number>(a), *y = cast<Number>(b); x) {
    double p = x->doubleValue(), q = y->doubleValue();
    if (x->isReal() != y->isReal() || x->isUnsigned() != y->isUnsigned()) return false;
    if (!x->isReal()) return x->uint64Value() == y->uint64Value();
    return p == q ? std::signbit(p) == std::signbit(q) : std::isnan(p) && std::isnan(q);
  }
  if (auto* x = cast<Array>(a), *y = cast<Array>(b); x) {
    bool same = x->count() == y->count();
    for (size_t i = 0; same && i < x->count(); ++i) same = identical(x->at(i), y->at(i), m);
    return same;
  }
  if (auto* x = cast<Dictionary>(a), *y = cast<Dictionary>(b); x) {
    bool same = x->count() == y->count();
    x->forEach([&](const Object& k, const Object& v) {
      same = same && !(m && cast<MutableString>(&k)) && identical(&v, y->get(k), m);
    });
    return same;
  }
  return a->isEqual(*b);
}

inline Ref<Object> S(std::string_view utf8) { return String::make(utf8); }
inline Ref<Object> I(int64_t v) { return Number::integer(v); }
inline Ref<Object> R(double v) { return Number::real(v); }
inline Ref<Object> B(std::string_view bytes) { return Data::copy(bytes); }
inline Ref<Object> A(std::vector<Ref<Object>> items) { return Array::build(std::move(items)); }
inline Ref<Object> D(std::vector<std::pair<std::string, Ref<Object>>> entries) {
  std::vector<std::pair<Ref<Object>, Ref<Object>>> pairs;
  for (auto& [k, v] : entries) pairs.emplace_back(S(k), v);
  return Dictionary::build(std::move(pairs));
}

constexpr Mutability kAllMutabilities[] = {Mutability::Immutable, Mutability::MutableContainers,
                                           Mutability::MutableContainersAndLeaves};

}  // namespace qrtest
