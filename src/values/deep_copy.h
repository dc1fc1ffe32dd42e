// Deep copies and the property-list value test.
#pragma once

#include "values/object.h"

namespace qr {

enum class Mutability {
  Immutable,
  MutableContainers,
  MutableContainersAndLeaves,
};

// Property-list values: strings, numbers, booleans, data, dates, and arrays
// and string-keyed dictionaries of them, nested at most kMaxPropertyListDepth.
constexpr size_t kMaxPropertyListDepth = 512;
bool isPropertyList(const Object& value);

// A copy of a property list down to its leaves; null when it holds anything
// that is not a property-list value, or nests too deep.
Ref<Object> deepCopy(const Object& value, Mutability mutability);

// True when value is already what a MutableContainersAndLeaves copy of it would
// be, and each of its containers and mutable leaves has one reference only: the
// holder of that one reference may then take the tree as its own copy.
bool isSoleMutableTree(const Object& value);

}  // namespace qr
