// Reads any bytes as an XML property list with each mutability option; every
// value read must write, read back identical, and write to the same text.
#include <cstdint>
#include <cstdlib>
#include <string_view>

#include "../tests/support/plist_identity.h"
#include "plist/property_list.h"

using namespace qr;

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::string_view bytes(reinterpret_cast<const char*>(data), size);
  Ref<Object> first;
  for (auto m : {Mutability::Immutable, Mutability::MutableContainers,
                 Mutability::MutableContainersAndLeaves}) {
    Ref<Object> value = readXMLPropertyList(bytes, m);
    // The option changes the kinds of objects, never whether a document reads.
    if (m == Mutability::Immutable)
      first = value;
    else if (!qrtest::identical(first.get(), value.get()))
      std::abort();
    if (!value) continue;
    auto xml = writeXMLPropertyList(*value);
    if (!xml) std::abort();  // whatever reads must be writable
    Ref<Object> back = readXMLPropertyList(*xml, m);
    if (!back || !qrtest::identical(value.get(), back.get())) std::abort();
    auto again = writeXMLPropertyList(*back);
    if (!again || *again != *xml) std::abort();
  }
  return 0;
}
