// Placeholder until the reader lands; it reads nothing.
#include "platform/property_list.h"

namespace qr {
Ref<Object> readXMLPropertyList(std::string_view, Mutability) { return nullptr; }
}  // namespace qr
