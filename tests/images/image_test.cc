// Image files made here with the codec libraries, converted, and the TIFF
// result read back with libtiff sample by sample.
#include <fcntl.h>
#include <gtest/gtest.h>
#include <png.h>
#include <tiffio.h>
#include <unistd.h>
#include <zlib.h>

#include <array>
#include <csetjmp>
#include <cstdio>
// clang-format off
#include <jpeglib.h>
// clang-format on

#include "images/image.h"
#include "support/temp_dir.h"

using namespace qr;
using qrtest::TempDir;

namespace {

using Pixels = std::vector<uint8_t>;  // RGBA, rows top to bottom

struct PngLayout {
  uint32_t width, height;
  int colorType;
  int depth = 8;
  bool interlaced = false;
  std::vector<png_color> palette;
  std::vector<png_byte> transparency;
  std::vector<uint8_t> samples;  // packed rows as the file holds them
};

bool writePNG(const std::string& path, const PngLayout& layout) {
  FILE* file = std::fopen(path.c_str(), "wb");
  if (!file) return false;
  png_structp png = png_create_write_struct(PNG_LIBPNG_VER_STRING, nullptr, nullptr, nullptr);
  png_infop info = png_create_info_struct(png);
  if (setjmp(png_jmpbuf(png))) {
    png_destroy_write_struct(&png, &info);
    std::fclose(file);
    return false;
  }
  png_init_io(png, file);
  png_set_IHDR(png, info, layout.width, layout.height, layout.depth, layout.colorType,
               layout.interlaced ? PNG_INTERLACE_ADAM7 : PNG_INTERLACE_NONE,
               PNG_COMPRESSION_TYPE_DEFAULT, PNG_FILTER_TYPE_DEFAULT);
  if (!layout.palette.empty())
    png_set_PLTE(png, info, layout.palette.data(), int(layout.palette.size()));
  if (!layout.transparency.empty())
    png_set_tRNS(png, info, layout.transparency.data(), int(layout.transparency.size()), nullptr);
  png_write_info(png, info);
  size_t rowBytes = png_get_rowbytes(png, info);
  std::vector<png_bytep> rows(layout.height);
  for (uint32_t y = 0; y < layout.height; ++y)
    rows[y] = const_cast<png_bytep>(layout.samples.data() + y * rowBytes);
  png_write_image(png, rows.data());
  png_write_end(png, nullptr);
  png_destroy_write_struct(&png, &info);
  return std::fclose(file) == 0;
}

bool writeJPEG(const std::string& path, uint32_t width, uint32_t height, const Pixels& rgb) {
  FILE* file = std::fopen(path.c_str(), "wb");
  if (!file) return false;
  jpeg_compress_struct info;
  jpeg_error_mgr errors;
  info.err = jpeg_std_error(&errors);
  jpeg_create_compress(&info);
  jpeg_stdio_dest(&info, file);
  info.image_width = width;
  info.image_height = height;
  info.input_components = 3;
  info.in_color_space = JCS_RGB;
  jpeg_set_defaults(&info);
  jpeg_set_quality(&info, 95, TRUE);
  jpeg_start_compress(&info, TRUE);
  while (info.next_scanline < height) {
    JSAMPROW row = const_cast<JSAMPROW>(rgb.data() + info.next_scanline * width * 3);
    jpeg_write_scanlines(&info, &row, 1);
  }
  jpeg_finish_compress(&info);
  jpeg_destroy_compress(&info);
  return std::fclose(file) == 0;
}

// Samples per pixel 1 to 4; with 2 or 4 the last sample is alpha of the given kind.
bool writeTIFF(const std::string& path, uint32_t width, uint32_t height, uint16_t samples,
               uint16_t alphaKind, const Pixels& data, uint16_t compression = COMPRESSION_NONE) {
  TIFF* tiff = TIFFOpen(path.c_str(), "w");
  if (!tiff) return false;
  TIFFSetField(tiff, TIFFTAG_IMAGEWIDTH, width);
  TIFFSetField(tiff, TIFFTAG_IMAGELENGTH, height);
  TIFFSetField(tiff, TIFFTAG_BITSPERSAMPLE, 8);
  TIFFSetField(tiff, TIFFTAG_SAMPLESPERPIXEL, samples);
  TIFFSetField(tiff, TIFFTAG_PHOTOMETRIC, samples >= 3 ? PHOTOMETRIC_RGB : PHOTOMETRIC_MINISBLACK);
  TIFFSetField(tiff, TIFFTAG_PLANARCONFIG, PLANARCONFIG_CONTIG);
  TIFFSetField(tiff, TIFFTAG_COMPRESSION, compression);
  TIFFSetField(tiff, TIFFTAG_ROWSPERSTRIP, 2);
  if (samples == 2 || samples == 4) TIFFSetField(tiff, TIFFTAG_EXTRASAMPLES, 1, &alphaKind);
  bool ok = true;
  for (uint32_t y = 0; y < height && ok; ++y)
    ok =
        TIFFWriteScanline(tiff, const_cast<uint8_t*>(data.data() + y * width * samples), y, 0) == 1;
  TIFFClose(tiff);
  return ok;
}

struct DecodedTIFF {
  uint32_t width = 0, height = 0;
  uint16_t samples = 0, bits = 0, photometric = 0, extraCount = 0, extraKind = 0;
  Pixels pixels;
};

// Reads the raw samples of the result, without libtiff's RGBA conversion.
std::optional<DecodedTIFF> readResult(const TempDir& dir, const Data& data) {
  std::string path = dir.write("result.tif", data.view());
  TIFF* tiff = TIFFOpen(path.c_str(), "r");
  if (!tiff) return std::nullopt;
  DecodedTIFF d;
  uint16_t* extras = nullptr;
  TIFFGetField(tiff, TIFFTAG_IMAGEWIDTH, &d.width);
  TIFFGetField(tiff, TIFFTAG_IMAGELENGTH, &d.height);
  TIFFGetField(tiff, TIFFTAG_SAMPLESPERPIXEL, &d.samples);
  TIFFGetField(tiff, TIFFTAG_BITSPERSAMPLE, &d.bits);
  TIFFGetField(tiff, TIFFTAG_PHOTOMETRIC, &d.photometric);
  if (TIFFGetField(tiff, TIFFTAG_EXTRASAMPLES, &d.extraCount, &extras) && d.extraCount)
    d.extraKind = extras[0];
  bool ok = d.samples == 4 && d.bits == 8 && TIFFScanlineSize(tiff) == tmsize_t(d.width) * 4;
  if (ok) d.pixels.resize(size_t(d.width) * d.height * 4);
  for (uint32_t y = 0; ok && y < d.height; ++y)
    ok = TIFFReadScanline(tiff, d.pixels.data() + size_t(y) * d.width * 4, y, 0) == 1;
  bool single = TIFFReadDirectory(tiff) == 0;
  TIFFClose(tiff);
  if (!ok || !single) return std::nullopt;
  return d;
}

// Converts the file and checks the result against the expected pixels, each
// sample within tolerance; colour is not compared where alpha is 0.
void expectConverted(const TempDir& dir, const std::string& path, uint32_t width, uint32_t height,
                     const Pixels& expected, int tolerance = 0) {
  Ref<Data> data = tiffRepresentationOfImageFile(path);
  ASSERT_TRUE(data) << path;
  auto result = readResult(dir, *data);
  ASSERT_TRUE(result) << "libtiff cannot read the result of " << path;
  EXPECT_EQ(result->photometric, PHOTOMETRIC_RGB);
  EXPECT_EQ(result->extraCount, 1);
  EXPECT_EQ(result->extraKind, EXTRASAMPLE_UNASSALPHA);
  ASSERT_EQ(result->width, width);
  ASSERT_EQ(result->height, height);
  for (size_t i = 0; i < expected.size(); ++i) {
    size_t pixel = i / 4;
    if (i % 4 != 3 && expected[pixel * 4 + 3] == 0) continue;
    ASSERT_NEAR(int(result->pixels[i]), int(expected[i]), tolerance)
        << path << ": pixel " << pixel << " sample " << i % 4;
  }
}

Pixels rgbaTestPattern(uint32_t width, uint32_t height) {
  Pixels p;
  for (uint32_t y = 0; y < height; ++y)
    for (uint32_t x = 0; x < width; ++x) {
      p.push_back(uint8_t(x * 255 / (width - 1)));
      p.push_back(uint8_t(y * 255 / (height - 1)));
      p.push_back(uint8_t((x + y) * 13));
      p.push_back(std::array<uint8_t, 4>{255, 200, 128, 0}[(x + y) % 4]);
    }
  return p;
}

// Runs f with standard error sent to a file; returns what was written there.
template <class F>
std::string stderrOf(const TempDir& dir, F&& f) {
  std::string path = dir / "stderr.txt";
  std::fflush(stderr);
  int saved = dup(2);
  int sink = open(path.c_str(), O_WRONLY | O_CREAT | O_TRUNC, 0600);
  dup2(sink, 2);
  close(sink);
  f();
  std::fflush(stderr);
  dup2(saved, 2);
  close(saved);
  return qrtest::readText(path);
}

std::string pngChunk(std::string_view type, std::string_view body) {
  auto be32 = [](uint32_t v) {
    return std::string{char(v >> 24), char(v >> 16), char(v >> 8), char(v)};
  };
  std::string typed = std::string(type) + std::string(body);
  return be32(uint32_t(body.size())) + typed +
         be32(uint32_t(crc32(0, reinterpret_cast<const Bytef*>(typed.data()), uInt(typed.size()))));
}

}  // namespace

TEST(Image, PNGOfEveryColourKindComesBackAsRGBA) {
  TempDir dir;
  // 8-bit RGBA with varied alpha, plain and interlaced.
  Pixels rgba = rgbaTestPattern(9, 7);
  // The format is told by content, not by name.
  for (bool interlaced : {false, true}) {
    std::string path = dir / (interlaced ? "adam7.png" : "rgba.tiff");
    ASSERT_TRUE(writePNG(path, {9, 7, PNG_COLOR_TYPE_RGBA, 8, interlaced, {}, {}, rgba}));
    expectConverted(dir, path, 9, 7, rgba);
  }

  // 4-bit palette with tRNS: entry 1 half transparent, entry 2 without alpha.
  std::vector<png_color> palette = {{10, 20, 30}, {200, 100, 0}, {0, 0, 255}};
  std::string path = dir / "palette.png";
  ASSERT_TRUE(
      writePNG(path, {4, 1, PNG_COLOR_TYPE_PALETTE, 4, false, palette, {0, 128}, {0x01, 0x22}}));
  expectConverted(dir, path, 4, 1,
                  {10, 20, 30, 0, 200, 100, 0, 128, 0, 0, 255, 255, 0, 0, 255, 255});

  // 16-bit grey without alpha: scaled to 8 bits, alpha opaque.
  path = dir / "grey16.png";
  ASSERT_TRUE(writePNG(
      path, {3, 1, PNG_COLOR_TYPE_GRAY, 16, false, {}, {}, {0x00, 0x00, 0x80, 0x80, 0xFF, 0xFF}}));
  expectConverted(dir, path, 3, 1, {0, 0, 0, 255, 128, 128, 128, 255, 255, 255, 255, 255});

  // Grey with alpha.
  path = dir / "grey-alpha.png";
  ASSERT_TRUE(
      writePNG(path, {2, 1, PNG_COLOR_TYPE_GRAY_ALPHA, 8, false, {}, {}, {50, 255, 90, 60}}));
  expectConverted(dir, path, 2, 1, {50, 50, 50, 255, 90, 90, 90, 60});
}

TEST(Image, JPEGComesBackWithinItsLossAndOpaque) {
  TempDir dir;
  const uint32_t w = 32, h = 24;
  Pixels rgb, expected;
  for (uint32_t y = 0; y < h; ++y)
    for (uint32_t x = 0; x < w; ++x) {
      uint8_t px[3] = {uint8_t(x * 8), uint8_t(y * 10), uint8_t(128 + x - y)};
      rgb.insert(rgb.end(), px, px + 3);
      expected.insert(expected.end(), px, px + 3);
      expected.push_back(255);
    }
  std::string path = dir / "photo.jpg";
  ASSERT_TRUE(writeJPEG(path, w, h, rgb));
  expectConverted(dir, path, w, h, expected, 12);
}

TEST(Image, TIFFComesBackWithItsAlphaUnassociated) {
  TempDir dir;
  Pixels rgba = rgbaTestPattern(5, 5);
  std::string path = dir / "rgba.tif";
  ASSERT_TRUE(writeTIFF(path, 5, 5, 4, EXTRASAMPLE_UNASSALPHA, rgba, COMPRESSION_LZW));
  // Decoding goes through premultiplied colour, which costs a step at alpha 128.
  expectConverted(dir, path, 5, 5, rgba, 1);

  // Associated alpha: colour is stored premultiplied and comes back unmultiplied.
  path = dir / "premultiplied.tif";
  ASSERT_TRUE(writeTIFF(path, 2, 1, 4, EXTRASAMPLE_ASSOCALPHA, {100, 50, 0, 128, 10, 20, 30, 255}));
  expectConverted(dir, path, 2, 1, {199, 100, 0, 128, 10, 20, 30, 255}, 1);

  // Grey with unassociated alpha, and plain RGB.
  path = dir / "grey-alpha.tif";
  ASSERT_TRUE(writeTIFF(path, 2, 1, 2, EXTRASAMPLE_UNASSALPHA, {200, 128, 40, 255}));
  expectConverted(dir, path, 2, 1, {200, 200, 200, 128, 40, 40, 40, 255});
  path = dir / "rgb.tif";
  ASSERT_TRUE(writeTIFF(path, 2, 1, 3, 0, {1, 2, 3, 250, 251, 252}));
  expectConverted(dir, path, 2, 1, {1, 2, 3, 255, 250, 251, 252, 255});
}

TEST(Image, AnythingButAWholeImageGivesNoneAndPrintsNothing) {
  TempDir dir;
  Pixels rgba = rgbaTestPattern(40, 40);
  std::string png = dir / "whole.png";
  ASSERT_TRUE(writePNG(png, {40, 40, PNG_COLOR_TYPE_RGBA, 8, false, {}, {}, rgba}));
  Pixels rgb(64 * 64 * 3);
  for (size_t i = 0; i < rgb.size(); ++i) rgb[i] = uint8_t(i * 7 % 251);
  std::string jpeg = dir / "whole.jpg";
  ASSERT_TRUE(writeJPEG(jpeg, 64, 64, rgb));
  std::string tiff = dir / "whole.tif";
  ASSERT_TRUE(writeTIFF(tiff, 40, 40, 4, EXTRASAMPLE_UNASSALPHA, rgba));

  auto truncated = [&](const std::string& whole, const std::string& name) {
    std::string bytes = qrtest::readText(whole);
    return dir.write(name, std::string_view(bytes).substr(0, bytes.size() * 3 / 5));
  };
  std::string pngHeader = "\x89PNG\r\n\x1a\n";
  std::string hugeIHDR =
      pngChunk("IHDR", std::string("\x00\x00\xEA\x60\x00\x00\xEA\x60\x08\x06\x00\x00\x00", 13));
  std::vector<std::string> bad = {
      dir.write("icon.png", "This is not a picture.\n"),
      truncated(png, "truncated.png"),
      truncated(jpeg, "truncated.jpg"),
      truncated(tiff, "truncated.tif"),
      dir.write("empty.png", ""),
      dir.write("magic-only.png", pngHeader),
      dir.write("tiff-header-only.tif", std::string("II*\0\x08\0\0\0", 8)),
      // 60000 x 60000 claimed, no pixel data behind it.
      dir.write("huge.png", pngHeader + hugeIHDR + pngChunk("IDAT", "xx") + pngChunk("IEND", "")),
      dir / "missing.png",
      dir.path(),
  };
  std::string printed = stderrOf(dir, [&] {
    for (const auto& path : bad) EXPECT_FALSE(tiffRepresentationOfImageFile(path)) << path;
  });
  EXPECT_EQ(printed, "");
  ASSERT_TRUE(tiffRepresentationOfImageFile(png)) << "the whole files do convert";
  ASSERT_TRUE(tiffRepresentationOfImageFile(jpeg));
  ASSERT_TRUE(tiffRepresentationOfImageFile(tiff));
}
