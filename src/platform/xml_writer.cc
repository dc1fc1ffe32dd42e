// Placeholder until the writer lands; it writes nothing.
#include "platform/property_list.h"

namespace qr {
std::optional<std::string> writeXMLPropertyList(const Object&) { return std::nullopt; }
}  // namespace qr
