// JPEG through libjpeg-turbo, to RGBA with opaque alpha. A file that ends
// early is refused at once (the library would pad it with grey and only warn).
#include <cstdio>  // jpeglib.h needs FILE and size_t first
// clang-format off
#include <jpeglib.h>
#include <jerror.h>
// clang-format on

#include <csetjmp>

#include "images/raster_image.h"

namespace qr {
namespace {

// Progressive files can hold a great many scans, each a pass over the whole
// image; real ones have around ten.
constexpr int kMaxScans = 256;
constexpr long kMaxDecoderMemory = 512L << 20;

struct JpegSession {
  jpeg_decompress_struct info;
  jpeg_error_mgr errors;
  jpeg_progress_mgr progress;
  std::jmp_buf jump;
  bool created;
};

JpegSession& sessionOf(j_common_ptr info) {
  return *reinterpret_cast<JpegSession*>(reinterpret_cast<char*>(info) -
                                         offsetof(JpegSession, info));
}

[[noreturn]] void onError(j_common_ptr info) { std::longjmp(sessionOf(info).jump, 1); }

void onMessage(j_common_ptr info, int level) {
  if (level < 0 && info->err->msg_code == JWRN_JPEG_EOF) onError(info);
}

void onOutput(j_common_ptr) {}

void onProgress(j_common_ptr info) {
  auto* decompress = reinterpret_cast<j_decompress_ptr>(info);
  if (decompress->input_scan_number > kMaxScans) onError(info);
}

// Both stages run under setjmp and hold nothing with a destructor.
bool start(JpegSession& s, const uint8_t* data, size_t size) {
  if (setjmp(s.jump)) return false;
  jpeg_create_decompress(&s.info);
  s.created = true;
  s.info.mem->max_memory_to_use = kMaxDecoderMemory;
  s.info.progress = &s.progress;
  jpeg_mem_src(&s.info, data, static_cast<unsigned long>(size));
  if (jpeg_read_header(&s.info, TRUE) != JPEG_HEADER_OK) return false;
  bool cmyk = s.info.jpeg_color_space == JCS_CMYK || s.info.jpeg_color_space == JCS_YCCK;
  s.info.out_color_space = cmyk ? JCS_CMYK : JCS_EXT_RGBA;
  if (uint64_t(s.info.image_width) * s.info.image_height > kMaxImagePixels) return false;
  jpeg_start_decompress(&s.info);
  return s.info.output_components == 4;
}

bool readRows(JpegSession& s, RasterImage& out) {
  if (setjmp(s.jump)) return false;
  while (s.info.output_scanline < s.info.output_height) {
    JSAMPROW row = out.row(s.info.output_scanline);
    if (jpeg_read_scanlines(&s.info, &row, 1) != 1) return false;
  }
  return true;
}

// CMYK as Adobe writes it holds inverted inks; other writers store them plain.
void cmykToRGBA(RasterImage& image, bool inverted) {
  uint8_t* p = image.rgba.get();
  size_t pixels = size_t(image.width) * image.height;
  for (size_t i = 0; i < pixels; ++i, p += 4) {
    unsigned k = inverted ? p[3] : 255 - p[3];
    for (int c = 0; c < 3; ++c) {
      unsigned ink = inverted ? p[c] : 255 - p[c];
      p[c] = static_cast<uint8_t>((ink * k + 127) / 255);
    }
    p[3] = 255;
  }
}

}  // namespace

bool decodeJPEG(std::span<const uint8_t> bytes, RasterImage& out) {
  auto session = std::make_unique<JpegSession>();
  JpegSession& s = *session;
  s.info.err = jpeg_std_error(&s.errors);
  s.errors.error_exit = onError;
  s.errors.emit_message = onMessage;
  s.errors.output_message = onOutput;
  s.progress.progress_monitor = onProgress;
  bool ok = start(s, bytes.data(), bytes.size()) &&
            out.allocate(s.info.output_width, s.info.output_height) && readRows(s, out);
  if (ok && s.info.out_color_space == JCS_CMYK) cmykToRGBA(out, s.info.saw_Adobe_marker);
  if (s.created) jpeg_destroy_decompress(&s.info);
  return ok;
}

}  // namespace qr
