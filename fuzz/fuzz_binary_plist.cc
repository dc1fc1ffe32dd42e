// Reads any bytes as a binary property list in each kind of mutability; whatever
// is read must be a property list whose deep copies equal it, and that the
// binary writer writes.
#include "deep_copy_check.h"
#include "plist/property_list.h"

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  checkDeepCopies(data, size, qr::readBinaryPropertyList);
  // Whatever is read is written, and that reads back to the same bytes.
  auto v = qr::readBinaryPropertyList({reinterpret_cast<const char*>(data), size},
                                      qr::Mutability::Immutable);
  auto out = v ? qr::writeBinaryPropertyList(*v) : std::nullopt;
  auto back = out ? qr::readBinaryPropertyList(*out, qr::Mutability::Immutable) : nullptr;
  if (v && (!back || qr::writeBinaryPropertyList(*back) != out)) std::abort();
  return 0;
}
