// Image files to TIFF data. The format is told by the file's first bytes, not
// by its name: an icon named .png may hold anything.
#include "images/image.h"

#include <string_view>

#include "images/raster_image.h"
#include "platform/file_stamp.h"

namespace qr {
namespace {

enum class ImageFormat { Unknown, PNG, JPEG, TIFF };

ImageFormat detectFormat(std::string_view bytes) {
  if (bytes.starts_with("\x89PNG\r\n\x1a\n")) return ImageFormat::PNG;
  if (bytes.starts_with("\xFF\xD8\xFF")) return ImageFormat::JPEG;
  // Classic and big TIFF, either byte order.
  using namespace std::string_view_literals;
  if (bytes.starts_with("II*\0"sv) || bytes.starts_with("MM\0*"sv) ||
      bytes.starts_with("II+\0"sv) || bytes.starts_with("MM\0+"sv))
    return ImageFormat::TIFF;
  return ImageFormat::Unknown;
}

}  // namespace

Ref<Data> tiffRepresentationOfImageFile(const std::string& path) {
  StampedFile file = readStampedFile(path, kMaxImageFileSize);
  if (!file.bytes) return nullptr;
  return tiffRepresentationOfImageData(*file.bytes);
}

Ref<Data> tiffRepresentationOfImageData(std::string_view data) {
  if (data.size() > kMaxImageFileSize) return nullptr;
  std::span<const uint8_t> bytes(reinterpret_cast<const uint8_t*>(data.data()), data.size());
  RasterImage image;
  bool decoded = false;
  switch (detectFormat(data)) {
    case ImageFormat::PNG:
      decoded = decodePNG(bytes, image);
      break;
    case ImageFormat::JPEG:
      decoded = decodeJPEG(bytes, image);
      break;
    case ImageFormat::TIFF:
      decoded = decodeTIFF(bytes, image);
      break;
    case ImageFormat::Unknown:
      break;
  }
  if (!decoded) return nullptr;
  std::optional<std::vector<uint8_t>> tiff = encodeTIFF(image);
  if (!tiff) return nullptr;
  return make<Data>(std::move(*tiff));
}

}  // namespace qr
