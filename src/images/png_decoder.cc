// PNG through libpng. Palette, grey, low bit depths and tRNS are expanded and
// 16-bit samples scaled, so every image comes out as 8-bit RGBA.
#include <png.h>

#include <csetjmp>
#include <cstring>
#include <vector>

#include "images/raster_image.h"

namespace qr {
namespace {

struct PngInput {
  const uint8_t* data;
  size_t size;
  size_t offset;
};

void readInput(png_structp png, png_bytep out, size_t count) {
  auto* in = static_cast<PngInput*>(png_get_io_ptr(png));
  if (count > in->size - in->offset) png_error(png, "truncated");
  std::memcpy(out, in->data + in->offset, count);
  in->offset += count;
}

[[noreturn]] void onError(png_structp png, png_const_charp) { png_longjmp(png, 1); }
void onWarning(png_structp, png_const_charp) {}

// The two stages below run under setjmp and hold nothing with a destructor,
// so a longjmp out of libpng skips no cleanup.
bool readHeader(png_structp png, png_infop info, png_uint_32* width, png_uint_32* height) {
  if (setjmp(png_jmpbuf(png))) return false;
  png_read_info(png, info);
  int depth = png_get_bit_depth(png, info);
  int colorType = png_get_color_type(png, info);
  bool hasAlpha = (colorType & PNG_COLOR_MASK_ALPHA) || png_get_valid(png, info, PNG_INFO_tRNS);
  if (depth == 16) png_set_scale_16(png);
  png_set_expand(png);
  if (!(colorType & PNG_COLOR_MASK_COLOR)) png_set_gray_to_rgb(png);
  if (!hasAlpha) png_set_add_alpha(png, 0xFF, PNG_FILLER_AFTER);
  png_set_interlace_handling(png);
  png_read_update_info(png, info);
  *width = png_get_image_width(png, info);
  *height = png_get_image_height(png, info);
  return png_get_rowbytes(png, info) == size_t(*width) * 4;
}

bool readRows(png_structp png, png_bytepp rows) {
  if (setjmp(png_jmpbuf(png))) return false;
  png_read_image(png, rows);
  return true;
}

}  // namespace

bool decodePNG(std::span<const uint8_t> bytes, RasterImage& out) {
  png_structp png = png_create_read_struct(PNG_LIBPNG_VER_STRING, nullptr, onError, onWarning);
  if (!png) return false;
  png_infop info = png_create_info_struct(png);
  if (!info) {
    png_destroy_read_struct(&png, nullptr, nullptr);
    return false;
  }
  PngInput input{bytes.data(), bytes.size(), 0};
  png_set_read_fn(png, &input, readInput);
  png_set_user_limits(png, kMaxImageSide, kMaxImageSide);
  png_uint_32 width = 0, height = 0;
  bool ok = readHeader(png, info, &width, &height) && out.allocate(width, height);
  if (ok) {
    std::vector<png_bytep> rows(height);
    for (png_uint_32 y = 0; y < height; ++y) rows[y] = out.row(y);
    ok = readRows(png, rows.data());
  }
  png_destroy_read_struct(&png, &info, nullptr);
  return ok;
}

}  // namespace qr
