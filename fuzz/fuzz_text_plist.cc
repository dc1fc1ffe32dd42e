// Reads any bytes as a text property list in each kind of mutability; whatever
// is read must be a property list whose deep copies equal it.
#include <cstdio>
#include <cstdlib>
#include <string_view>

#include "platform/deep_copy.h"
#include "platform/property_list.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::string_view bytes(reinterpret_cast<const char*>(data), size);
  for (auto m : {qr::Mutability::Immutable, qr::Mutability::MutableContainers,
                 qr::Mutability::MutableContainersAndLeaves}) {
    auto value = qr::readTextPropertyList(bytes, m);
    if (!value) continue;
    auto copy = qr::deepCopy(*value, m);
    if (!copy || !qr::equal(copy, value) || !copy->isEqual(*value)) {
      std::fprintf(stderr, "deep copy differs from what was read (mutability %d)\n",
                   static_cast<int>(m));
      std::abort();
    }
  }
  return 0;
}
