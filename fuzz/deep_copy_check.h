// Reads the bytes with reader in each kind of mutability; whatever is read
// must be a property list whose deep copy equals it.
#pragma once

#include <cstdio>
#include <cstdlib>
#include <string_view>

#include "values/deep_copy.h"
#include "values/object.h"

template <class Reader>
void checkDeepCopies(const uint8_t* data, size_t size, Reader read) {
  std::string_view bytes(reinterpret_cast<const char*>(data), size);
  for (auto m : {qr::Mutability::Immutable, qr::Mutability::MutableContainers,
                 qr::Mutability::MutableContainersAndLeaves}) {
    auto value = read(bytes, m);
    if (!value) continue;
    auto copy = qr::deepCopy(*value, m);
    if (!copy || !qr::equal(copy, value) || !copy->isEqual(*value)) {
      std::fprintf(stderr, "deep copy differs from what was read (mutability %d)\n",
                   static_cast<int>(m));
      std::abort();
    }
  }
}
