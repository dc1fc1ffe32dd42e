// The image facility: decodes PNG, JPEG and TIFF files and re-encodes them as
// TIFF (8-bit RGBA, alpha kept).
#pragma once

#include <string>
#include <string_view>

#include "values/data.h"
#include "values/object.h"

namespace qr {

// The TIFF encoding of the image in the file; null when the file is missing,
// unreadable or not a decodable image.
Ref<Data> tiffRepresentationOfImageFile(const std::string& path);
// The same for the bytes of an image file.
Ref<Data> tiffRepresentationOfImageData(std::string_view bytes);

}  // namespace qr
