// Image files written here with the codec libraries from generated pixels,
// converted, and the TIFF result decoded again.
#include "images/image.h"

#include <gtest/gtest.h>
#include <png.h>
#include <tiffio.h>

#include <cstdio>
#include <functional>
#include <random>
// clang-format off
#include <jpeglib.h>
// clang-format on

#include "images/raster_image.h"
#include "support/temp_dir.h"

using namespace qr;
using Pixels = std::vector<uint8_t>;

struct Raster {
  uint32_t w, h;
  Pixels rgba;  // RGBA, rows top to bottom
};

// Each writer stores the raster in one layout of its format and gives the
// pixels that converting the file must give back. PNG goes through libpng's
// simplified writer; its colour map has 16 entries, each with its own alpha.
static Pixels writePNG(png_uint_32 format, const std::string& path, const Raster& r) {
  Pixels file, expected, map;
  for (int i = 0; i < 16; ++i)
    map.insert(map.end(), {uint8_t(i * 16), uint8_t(255 - i * 9), uint8_t(i * i),
                           uint8_t(i ? 135 + i * 8 : 0)});
  for (size_t i = 0; i < r.rgba.size(); i += 4) {
    const uint8_t *p = &r.rgba[i], k = p[0] % 16;
    Pixels in(p, p + 4), out = in;
    if (format == PNG_FORMAT_RGB) in.pop_back(), out[3] = 255;
    // 16 bits a sample: p[0] in both bytes, 257 p[0], scales back to p[0].
    if (format == PNG_FORMAT_LINEAR_Y) in = {p[0], p[0]}, out = {p[0], p[0], p[0], 255};
    if (format == PNG_FORMAT_RGBA_COLORMAP) in = {k}, out = Pixels(&map[k * 4], &map[k * 4 + 4]);
    file.insert(file.end(), in.begin(), in.end());
    expected.insert(expected.end(), out.begin(), out.end());
  }
  png_image image{nullptr, PNG_IMAGE_VERSION, r.w, r.h, format, 0, 16, 0, {}};  // 16 map entries
  png_image_write_to_file(&image, path.c_str(), 0, file.data(), 0, map.data());
  return expected;
}

// In blocks of 8 by 8 pixels of one colour, so the loss stays small. CMYK
// takes the raster's samples as inks, which Adobe's files hold inverted.
static Pixels writeJPEG(bool cmyk, bool adobe, const std::string& path, const Raster& r) {
  Pixels file, expected;
  for (uint32_t i = 0; i < r.w * r.h; ++i) {
    const uint8_t* p = &r.rgba[((i / r.w & ~7u) * r.w + (i % r.w & ~7u)) * 4];
    for (int c = 0; c < 4; ++c)
      expected.push_back(c == 3 ? 255 : cmyk ? (255 - p[c]) * (255 - p[3]) / 255 : p[c]);
    for (int c = 0; c < (cmyk ? 4 : 3); ++c) file.push_back(adobe ? 255 - p[c] : p[c]);
  }
  jpeg_compress_struct info;
  jpeg_error_mgr errors;
  info.err = jpeg_std_error(&errors);
  jpeg_create_compress(&info);
  FILE* out = std::fopen(path.c_str(), "wb");
  jpeg_stdio_dest(&info, out);
  info.image_width = r.w;
  info.image_height = r.h;
  info.input_components = cmyk ? 4 : 3;
  info.in_color_space = cmyk ? JCS_CMYK : JCS_RGB;
  jpeg_set_defaults(&info);
  jpeg_set_quality(&info, 98, TRUE);
  for (int c = 0; c < info.num_components; ++c)
    info.comp_info[c].h_samp_factor = info.comp_info[c].v_samp_factor = 1;
  info.write_Adobe_marker = adobe;
  jpeg_start_compress(&info, TRUE);
  for (JSAMPROW row = file.data(); row < file.data() + file.size(); row += r.w * (cmyk ? 4 : 3))
    jpeg_write_scanlines(&info, &row, 1);
  jpeg_finish_compress(&info);
  jpeg_destroy_compress(&info);
  std::fclose(out);
  return expected;
}

// mode as TIFFOpen takes it: byte order, classic or big TIFF. Grey when fewer
// than 3 samples; an even count ends in alpha of the given kind.
static Pixels writeTIFF(const char* mode, uint16_t samples, uint16_t alphaKind,
                        const std::string& path, const Raster& r) {
  bool grey = samples < 3, alpha = samples % 2 == 0;
  Pixels file, expected;
  for (size_t i = 0; i < r.rgba.size(); i += 4) {
    const uint8_t* p = &r.rgba[i];
    for (int c = 0; c < (grey ? 1 : 3); ++c)
      file.push_back(alphaKind == EXTRASAMPLE_ASSOCALPHA ? (p[c] * p[3] + 127) / 255 : p[c]);
    if (alpha) file.push_back(p[3]);
    expected.insert(expected.end(),
                    {p[0], p[grey ? 0 : 1], p[grey ? 0 : 2], alpha ? p[3] : uint8_t(255)});
  }
  TIFF* tiff = TIFFOpen(path.c_str(), mode);
  TIFFSetField(tiff, TIFFTAG_IMAGEWIDTH, r.w);
  TIFFSetField(tiff, TIFFTAG_IMAGELENGTH, r.h);
  TIFFSetField(tiff, TIFFTAG_BITSPERSAMPLE, 8);
  TIFFSetField(tiff, TIFFTAG_SAMPLESPERPIXEL, samples);
  TIFFSetField(tiff, TIFFTAG_PHOTOMETRIC, grey ? PHOTOMETRIC_MINISBLACK : PHOTOMETRIC_RGB);
  if (alpha) TIFFSetField(tiff, TIFFTAG_EXTRASAMPLES, 1, &alphaKind);
  TIFFWriteEncodedStrip(tiff, 0, file.data(), tmsize_t(file.size()));
  TIFFClose(tiff);
  return expected;
}

// The pixels of the file as converted: the TIFF result, decoded again.
static Pixels convert(const std::string& path) {
  Ref<Data> tiff = tiffRepresentationOfImageFile(path);
  RasterImage image;
  if (!tiff || !decodeTIFF({tiff->bytes(), tiff->length()}, image)) return {};
  return Pixels(image.rgba.get(), image.rgba.get() + size_t(image.width) * image.height * 4);
}

using Writer = std::function<Pixels(const std::string&, const Raster&)>;

TEST(Image, EveryLayoutOfEveryFormatConvertsToTheSamePixels) {
  // Colour with alpha goes through premultiplied forms, a step lost each time.
  // Layout, its writer, and how far a sample may be off.
  const std::tuple<const char*, Writer, int> layouts[] = {
      {"PNG RGBA", std::bind_front(writePNG, PNG_FORMAT_RGBA), 1},
      {"PNG RGB", std::bind_front(writePNG, PNG_FORMAT_RGB), 0},
      {"PNG grey 16", std::bind_front(writePNG, PNG_FORMAT_LINEAR_Y), 0},
      {"PNG palette", std::bind_front(writePNG, PNG_FORMAT_RGBA_COLORMAP), 1},
      {"JPEG RGB", std::bind_front(writeJPEG, false, false), 4},
      {"JPEG CMYK", std::bind_front(writeJPEG, true, false), 4},
      {"JPEG CMYK Adobe", std::bind_front(writeJPEG, true, true), 4},
      {"TIFF RGBA", std::bind_front(writeTIFF, "w", 4, EXTRASAMPLE_UNASSALPHA), 2},
      {"TIFF MM associated", std::bind_front(writeTIFF, "wb", 4, EXTRASAMPLE_ASSOCALPHA), 2},
      {"BigTIFF grey alpha", std::bind_front(writeTIFF, "w8", 2, EXTRASAMPLE_UNASSALPHA), 1},
      {"BigTIFF MM RGB", std::bind_front(writeTIFF, "wb8", 3, 0), 0},
  };
  qrtest::TempDir dir;
  std::mt19937 random(3);
  for (int round = 0; round < 4; ++round) {
    // Alpha is 0 or at least 128, where unpremultiplying costs at most a step.
    Raster raster{uint32_t(1 + random() % 24), uint32_t(1 + random() % 24), {}};
    for (size_t i = 0; i < raster.w * raster.h * 4; ++i)
      raster.rgba.push_back(uint8_t(i % 4 < 3 ? random() : random() % 2 * (128 + random() % 128)));
    for (const auto& [name, write, tolerance] : layouts) {
      SCOPED_TRACE(::testing::Message() << name << " " << raster.w << "x" << raster.h);
      std::string path = dir / "image";  // the format is told by content, not by name
      Pixels expected = write(path, raster), got = convert(path);
      ASSERT_EQ(got.size(), expected.size());
      for (size_t i = 0; i < expected.size(); ++i)  // no colour where there is no alpha
        ASSERT_NEAR(got[i], expected[i], i % 4 == 3 || expected[i | 3] ? tolerance : 255)
            << "pixel " << i / 4 << " sample " << i % 4;
      // Cut short in its pixels (or, for TIFF, its directory at the end), it is no image.
      std::filesystem::resize_file(path, std::filesystem::file_size(path) - 20);
      ::testing::internal::CaptureStderr();
      EXPECT_TRUE(convert(path).empty()) << "cut short";
      EXPECT_EQ(::testing::internal::GetCapturedStderr(), "") << "the decoders print nothing";
    }
  }
}

TEST(Image, HugeClaimsAndWhatIsNoImageGiveNoneAndPrintNothing) {
  // At most 65536 pixels a side and 16 Mi pixels in all.
  const std::tuple<uint64_t, uint64_t, bool> sizes[] = {
      {65536, 1, true},    {65537, 1, false}, {1, 65537, false}, {4096, 4096, true},
      {4097, 4096, false}, {0, 1, false},     {1, 0, false}};
  for (const auto& [w, h, allowed] : sizes)
    EXPECT_EQ(RasterImage().allocate(w, h), allowed) << w << "x" << h;
  qrtest::TempDir dir;
  writeJPEG(false, false, dir / "jpeg", {8, 8, Pixels(8 * 8 * 4)});
  std::string jpeg = qrtest::readText(dir / "jpeg");
  jpeg.replace(jpeg.find("\xFF\xC0") + 5, 4, "\xEA\x60\xEA\x60");  // 60000 x 60000 claimed
  ::testing::internal::CaptureStderr();
  for (const std::string& path : {dir.write("huge", jpeg), dir.write("text", "Not a picture.\n"),
                                  dir.write("empty", ""), dir / "missing", dir.path()})
    EXPECT_FALSE(tiffRepresentationOfImageFile(path)) << path;
  EXPECT_EQ(::testing::internal::GetCapturedStderr(), "");
}
