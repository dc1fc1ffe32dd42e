// TIFF through libtiff, read from and written to memory. Every handle gets
// silent error and warning handlers of its own, so a broken file costs no
// output and other libtiff users in the process keep their handlers.
#include <tiffio.h>

#include <cstdarg>
#include <cstring>
#include <limits>

#include "images/raster_image.h"

namespace qr {
namespace {

// The largest output accepted: the raw pixels at the size limit, with room.
constexpr size_t kMaxEncodedSize = size_t(kMaxImagePixels) * 4 + (size_t(16) << 20);

// A file in memory: read-only over the input bytes, or a growing buffer.
struct MemoryFile {
  const uint8_t* input = nullptr;
  std::vector<uint8_t>* output = nullptr;
  uint64_t size = 0;
  uint64_t offset = 0;
};

MemoryFile& fileOf(thandle_t handle) { return *static_cast<MemoryFile*>(handle); }

tmsize_t readMemory(thandle_t handle, void* buffer, tmsize_t count) {
  MemoryFile& f = fileOf(handle);
  if (count < 0) return -1;
  uint64_t available = f.offset < f.size ? f.size - f.offset : 0;
  uint64_t n = std::min<uint64_t>(uint64_t(count), available);
  const uint8_t* source = f.input ? f.input : f.output->data();
  if (n) std::memcpy(buffer, source + f.offset, n);
  f.offset += n;
  return tmsize_t(n);
}

tmsize_t writeMemory(thandle_t handle, void* buffer, tmsize_t count) {
  MemoryFile& f = fileOf(handle);
  if (!f.output || count < 0 || f.offset > kMaxEncodedSize ||
      uint64_t(count) > kMaxEncodedSize - f.offset)
    return -1;
  uint64_t end = f.offset + uint64_t(count);
  if (end > f.output->size()) f.output->resize(end);
  if (count) std::memcpy(f.output->data() + f.offset, buffer, size_t(count));
  f.offset = end;
  f.size = std::max<uint64_t>(f.size, end);
  return count;
}

toff_t seekMemory(thandle_t handle, toff_t offset, int whence) {
  MemoryFile& f = fileOf(handle);
  uint64_t base = whence == SEEK_SET ? 0 : whence == SEEK_CUR ? f.offset : f.size;
  // libtiff passes negative relative offsets as their two's complement.
  uint64_t target = base + offset;
  if (whence != SEEK_SET && int64_t(offset) < 0 && uint64_t(-int64_t(offset)) > base)
    return toff_t(-1);
  if (target > (uint64_t(1) << 62)) return toff_t(-1);
  f.offset = target;
  return target;
}

int closeMemory(thandle_t) { return 0; }
toff_t sizeOfMemory(thandle_t handle) { return fileOf(handle).size; }
int mapNothing(thandle_t, void**, toff_t*) { return 0; }
void unmapNothing(thandle_t, void*, toff_t) {}

int ignoreMessage(TIFF*, void*, const char*, const char*, va_list) { return 1; }

TIFF* openMemory(MemoryFile& file, const char* mode) {
  TIFFOpenOptions* options = TIFFOpenOptionsAlloc();
  if (!options) return nullptr;
  TIFFOpenOptionsSetErrorHandlerExtR(options, ignoreMessage, nullptr);
  TIFFOpenOptionsSetWarningHandlerExtR(options, ignoreMessage, nullptr);
  TIFFOpenOptionsSetMaxSingleMemAlloc(options, tmsize_t(kMaxEncodedSize));
  TIFF* tiff = TIFFClientOpenExt("image", mode, &file, readMemory, writeMemory, seekMemory,
                                 closeMemory, sizeOfMemory, mapNothing, unmapNothing, options);
  TIFFOpenOptionsFree(options);
  return tiff;
}

// libtiff's RGBA reader premultiplies colour by alpha for RGB images with
// unassociated alpha and passes associated alpha through; grey with
// unassociated alpha and unspecified extra samples come out as stored.
bool comesOutPremultiplied(const TIFFRGBAImage& image) {
  if (image.alpha == EXTRASAMPLE_ASSOCALPHA) return true;
  bool grey =
      image.photometric == PHOTOMETRIC_MINISBLACK || image.photometric == PHOTOMETRIC_MINISWHITE;
  return image.alpha == EXTRASAMPLE_UNASSALPHA && !grey;
}

void unpackPixels(const uint32_t* raster, bool premultiplied, RasterImage& out) {
  uint8_t* p = out.rgba.get();
  size_t pixels = size_t(out.width) * out.height;
  for (size_t i = 0; i < pixels; ++i, p += 4) {
    uint32_t v = raster[i];
    unsigned r = TIFFGetR(v), g = TIFFGetG(v), b = TIFFGetB(v), a = TIFFGetA(v);
    if (premultiplied && a != 255) {
      auto unmultiply = [a](unsigned c) {
        return a == 0 ? 0u : std::min(255u, (c * 255 + a / 2) / a);
      };
      r = unmultiply(r);
      g = unmultiply(g);
      b = unmultiply(b);
    }
    p[0] = uint8_t(r);
    p[1] = uint8_t(g);
    p[2] = uint8_t(b);
    p[3] = uint8_t(a);
  }
}

bool readFirstImage(TIFF* tiff, RasterImage& out) {
  char message[1024];
  if (!TIFFRGBAImageOK(tiff, message)) return false;
  TIFFRGBAImage image;
  if (!TIFFRGBAImageBegin(&image, tiff, 1, message)) return false;
  bool ok = out.allocate(image.width, image.height);
  std::unique_ptr<uint32_t[]> raster;
  if (ok) {
    raster.reset(new (std::nothrow) uint32_t[size_t(image.width) * image.height]);
    ok = raster != nullptr;
  }
  if (ok) {
    image.req_orientation = ORIENTATION_TOPLEFT;
    ok = TIFFRGBAImageGet(&image, raster.get(), image.width, image.height) != 0;
  }
  if (ok) unpackPixels(raster.get(), comesOutPremultiplied(image), out);
  TIFFRGBAImageEnd(&image);
  return ok;
}

}  // namespace

bool RasterImage::allocate(uint64_t w, uint64_t h) {
  if (w == 0 || h == 0 || w > kMaxImageSide || h > kMaxImageSide || w * h > kMaxImagePixels)
    return false;
  rgba.reset(new (std::nothrow) uint8_t[w * h * 4]);
  if (!rgba) return false;
  width = uint32_t(w);
  height = uint32_t(h);
  return true;
}

bool decodeTIFF(std::span<const uint8_t> bytes, RasterImage& out) {
  MemoryFile file;
  file.input = bytes.data();
  file.size = bytes.size();
  // "m": no memory mapping; the bytes are already in memory.
  TIFF* tiff = openMemory(file, "rm");
  if (!tiff) return false;
  bool ok = readFirstImage(tiff, out);
  TIFFClose(tiff);
  return ok;
}

std::optional<std::vector<uint8_t>> encodeTIFF(const RasterImage& image) {
  std::vector<uint8_t> bytes;
  MemoryFile file;
  file.output = &bytes;
  TIFF* tiff = openMemory(file, "w");
  if (!tiff) return std::nullopt;
  uint16_t extra[] = {EXTRASAMPLE_UNASSALPHA};
  bool ok = TIFFSetField(tiff, TIFFTAG_IMAGEWIDTH, image.width) &&
            TIFFSetField(tiff, TIFFTAG_IMAGELENGTH, image.height) &&
            TIFFSetField(tiff, TIFFTAG_BITSPERSAMPLE, 8) &&
            TIFFSetField(tiff, TIFFTAG_SAMPLESPERPIXEL, 4) &&
            TIFFSetField(tiff, TIFFTAG_EXTRASAMPLES, 1, extra) &&
            TIFFSetField(tiff, TIFFTAG_PHOTOMETRIC, PHOTOMETRIC_RGB) &&
            TIFFSetField(tiff, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG) &&
            TIFFSetField(tiff, TIFFTAG_ORIENTATION, ORIENTATION_TOPLEFT) &&
            TIFFSetField(tiff, TIFFTAG_COMPRESSION, COMPRESSION_LZW) &&
            TIFFSetField(tiff, TIFFTAG_PREDICTOR, PREDICTOR_HORIZONTAL) &&
            TIFFSetField(tiff, TIFFTAG_ROWSPERSTRIP, TIFFDefaultStripSize(tiff, 0));
  for (uint32_t y = 0; ok && y < image.height; ++y)
    ok = TIFFWriteScanline(tiff, image.row(y), y, 0) == 1;
  ok = ok && TIFFWriteDirectory(tiff);
  TIFFClose(tiff);
  if (!ok) return std::nullopt;
  bytes.resize(file.size);
  return bytes;
}

}  // namespace qr
