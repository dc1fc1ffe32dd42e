// The expat-based XML reader on its own, for the code that must compare the
// plain scanner with it; everyone else calls readXMLPropertyList.
#pragma once

#include <string_view>

#include "values/deep_copy.h"
#include "values/object.h"

namespace qr {

Ref<Object> readXMLPropertyListWithExpat(std::string_view bytes, Mutability mutability);

}  // namespace qr
