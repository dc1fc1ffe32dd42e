// The image facility: decodes PNG, JPEG and TIFF files and re-encodes them as
// TIFF (8-bit RGBA, alpha kept).
#pragma once

#include <string>

#include "values/data.h"
#include "values/object.h"

namespace qr {

// The TIFF encoding of the image in the file; null when the file is missing,
// unreadable or not a decodable image.
Ref<Data> tiffRepresentationOfImageFile(const std::string& path);

}  // namespace qr
