#include "values/deep_copy.h"

#include "values/array.h"
#include "values/data.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace qr {
namespace {

bool check(const Object& v, size_t depth) {
  if (depth > kMaxPropertyListDepth) return false;
  switch (v.kind()) {
    case TypeKind::String:
    case TypeKind::Number:
    case TypeKind::Boolean:
    case TypeKind::Data:
    case TypeKind::Date:
      return true;
    case TypeKind::Array:
      for (const auto& item : static_cast<const Array&>(v))
        if (!check(*item, depth + 1)) return false;
      return true;
    case TypeKind::Dictionary: {
      bool ok = true;
      static_cast<const Dictionary&>(v).forEach([&](const Object& k, const Object& value) {
        ok = ok && k.kind() == TypeKind::String && check(value, depth + 1);
      });
      return ok;
    }
    default:
      return false;
  }
}

Ref<Object> copy(const Object& v, Mutability m, size_t depth) {
  if (depth > kMaxPropertyListDepth) return nullptr;
  bool mutableContainers = m != Mutability::Immutable;
  bool mutableLeaves = m == Mutability::MutableContainersAndLeaves;
  switch (v.kind()) {
    case TypeKind::String: {
      const auto& s = static_cast<const String&>(v);
      if (mutableLeaves) return s.mutableCopy();
      return s.copy();
    }
    case TypeKind::Data: {
      const auto& d = static_cast<const Data&>(v);
      if (mutableLeaves)
        return qr::make<MutableData>(std::vector<uint8_t>(d.bytes(), d.bytes() + d.length()));
      if (!dynamic_cast<const MutableData*>(&d)) return Ref<Object>(const_cast<Object*>(&v));
      return Data::copy(d.span());
    }
    case TypeKind::Number:
    case TypeKind::Boolean:
    case TypeKind::Date:
      // Immutable in every kind of copy.
      return Ref<Object>(const_cast<Object*>(&v));
    case TypeKind::Array: {
      const auto& a = static_cast<const Array&>(v);
      std::vector<Ref<Object>> items;
      items.reserve(a.count());
      for (const auto& item : a) {
        auto c = copy(*item, m, depth + 1);
        if (!c) return nullptr;
        items.push_back(std::move(c));
      }
      if (mutableContainers) return qr::make<MutableArray>(std::move(items));
      return Array::build(std::move(items));
    }
    case TypeKind::Dictionary: {
      const auto& d = static_cast<const Dictionary&>(v);
      std::vector<std::pair<Ref<Object>, Ref<Object>>> pairs;
      pairs.reserve(d.count());
      bool ok = true;
      d.forEach([&](const Object& k, const Object& value) {
        if (!ok) return;
        if (k.kind() != TypeKind::String) {
          ok = false;
          return;
        }
        auto c = copy(value, m, depth + 1);
        if (!c) {
          ok = false;
          return;
        }
        // Keys stay immutable in every kind of copy.
        pairs.emplace_back(static_cast<const String&>(k).copy(), std::move(c));
      });
      if (!ok) return nullptr;
      if (!mutableContainers) return Dictionary::build(std::move(pairs));
      return MutableDictionary::build(pairs);
    }
    default:
      return nullptr;
  }
}

// Numbers, booleans and dates are shared by every copy, so only the nodes a
// copy would make afresh must be unshared.
bool soleMutable(const Object& v, size_t depth) {
  if (depth > kMaxPropertyListDepth) return false;
  switch (v.kind()) {
    case TypeKind::Number:
    case TypeKind::Boolean:
    case TypeKind::Date:
      return true;
    case TypeKind::String:
      return v.retainCount() == 1 && dynamic_cast<const MutableString*>(&v);
    case TypeKind::Data:
      return v.retainCount() == 1 && dynamic_cast<const MutableData*>(&v);
    case TypeKind::Array: {
      if (v.retainCount() != 1 || !dynamic_cast<const MutableArray*>(&v)) return false;
      for (const auto& item : static_cast<const Array&>(v))
        if (!soleMutable(*item, depth + 1)) return false;
      return true;
    }
    case TypeKind::Dictionary: {
      if (v.retainCount() != 1 || !dynamic_cast<const MutableDictionary*>(&v)) return false;
      bool ok = true;
      // A copy's keys are immutable strings.
      static_cast<const Dictionary&>(v).forEach([&](const Object& k, const Object& value) {
        ok = ok && k.kind() == TypeKind::String && !dynamic_cast<const MutableString*>(&k) &&
             soleMutable(value, depth + 1);
      });
      return ok;
    }
    default:
      return false;
  }
}

}  // namespace

bool isSoleMutableTree(const Object& value) { return soleMutable(value, 1); }

bool isPropertyList(const Object& value) { return check(value, 1); }

Ref<Object> deepCopy(const Object& value, Mutability mutability) {
  return copy(value, mutability, 1);
}

}  // namespace qr
