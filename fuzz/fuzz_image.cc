// Icon files from the input through the image decoders and the TIFF encoder.
#include <stdlib.h>
#include <unistd.h>

#include <cstdint>
#include <filesystem>
#include <string>
#include <string_view>

#include "images/image.h"
#include "platform/file_io.h"

namespace {

const std::string& iconPath() {
  static const std::string path = [] {
    std::string dir = (std::filesystem::temp_directory_path() / "quarrin-fuzz-XXXXXX").string();
    if (!mkdtemp(dir.data())) abort();
    return dir + "/icon";
  }();
  return path;
}

}  // namespace

extern "C" int LLVMFuzzerTestOneInput(const uint8_t* data, size_t size) {
  std::string_view bytes(reinterpret_cast<const char*>(data), size);
  if (!qr::writeFile(iconPath(), bytes)) abort();
  (void)qr::tiffRepresentationOfImageFile(iconPath());
  return 0;
}
