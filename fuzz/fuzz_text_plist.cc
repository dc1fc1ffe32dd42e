// Reads any bytes as a text property list in each kind of mutability; whatever
// is read must be a property list whose deep copies equal it.
#include "deep_copy_check.h"
#include "plist/property_list.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  checkDeepCopies(data, size, qr::readTextPropertyList);
  return 0;
}
