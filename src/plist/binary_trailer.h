// The fixed layout of a "bplist00" file: header, objects, offset table, and the
// 32-byte trailer that locates everything else.
#pragma once

#include <cstdint>
#include <optional>
#include <string_view>

namespace qr::bplist {

constexpr size_t kHeaderSize = 8;
constexpr size_t kTrailerSize = 32;

struct Trailer {
  uint8_t offsetSize;  // bytes per entry of the offset table
  uint8_t refSize;     // bytes per object reference inside containers
  uint64_t objectCount;
  uint64_t topObject;
  uint64_t offsetTableOffset;
};

// The trailer, once it and the offset table it describes are known to fit in
// the file between the header and the trailer; none otherwise.
std::optional<Trailer> readTrailer(std::string_view file);

// An unsigned big-endian integer of 1 to 8 bytes.
inline uint64_t readBigEndian(const unsigned char* p, size_t n) noexcept {
  uint64_t v = 0;
  for (size_t i = 0; i < n; ++i) v = (v << 8) | p[i];
  return v;
}

}  // namespace qr::bplist
