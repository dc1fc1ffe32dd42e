// The image facility's internal form: 8-bit RGBA pixels, unassociated alpha,
// rows top to bottom. Each decoder fills one from a file's bytes; the TIFF
// encoder writes one out.
#pragma once

#include <cstddef>
#include <cstdint>
#include <memory>
#include <optional>
#include <span>
#include <vector>

namespace qr {

// A hostile header can claim any size; an icon is far below these. At the
// pixel limit the decoded image takes 64 MiB and converts in about a second.
constexpr uint64_t kMaxImagePixels = uint64_t(16) << 20;
constexpr uint32_t kMaxImageSide = 1u << 16;
constexpr size_t kMaxImageFileSize = size_t(256) << 20;

struct RasterImage {
  uint32_t width = 0;
  uint32_t height = 0;
  std::unique_ptr<uint8_t[]> rgba;  // width * height * 4 bytes

  // Checks the size against the limits and allocates the pixels, which are
  // left uninitialised: a failed decode of a huge claimed size touches little.
  bool allocate(uint64_t w, uint64_t h);
  uint8_t* row(uint32_t y) const noexcept { return rgba.get() + size_t(y) * width * 4; }
};

// Each gives false for data it cannot decode completely; none writes to stderr.
bool decodePNG(std::span<const uint8_t> bytes, RasterImage& out);
bool decodeJPEG(std::span<const uint8_t> bytes, RasterImage& out);
bool decodeTIFF(std::span<const uint8_t> bytes, RasterImage& out);

// Baseline TIFF, 4 samples with unassociated alpha, LZW with the horizontal
// predictor; none on failure.
std::optional<std::vector<uint8_t>> encodeTIFF(const RasterImage& image);

}  // namespace qr
