#include "plist/binary_trailer.h"

namespace qr::bplist {

std::optional<Trailer> readTrailer(std::string_view file) {
  // Header, at least one one-byte object, a one-byte offset table, trailer.
  if (file.size() < kHeaderSize + 2 + kTrailerSize) return std::nullopt;
  if (file.substr(0, kHeaderSize) != "bplist00") return std::nullopt;
  const auto* t = reinterpret_cast<const unsigned char*>(file.data()) + file.size() - kTrailerSize;
  // Bytes 0-5 are unused (the sort version among them).
  Trailer tr;
  tr.offsetSize = t[6];
  tr.refSize = t[7];
  tr.objectCount = readBigEndian(t + 8, 8);
  tr.topObject = readBigEndian(t + 16, 8);
  tr.offsetTableOffset = readBigEndian(t + 24, 8);
  if (tr.offsetSize < 1 || tr.offsetSize > 8 || tr.refSize < 1 || tr.refSize > 8)
    return std::nullopt;
  if (tr.objectCount == 0 || tr.topObject >= tr.objectCount) return std::nullopt;
  // Objects sit between the header and the offset table; the table must end
  // before the trailer starts.
  uint64_t tableEnd = file.size() - kTrailerSize;
  if (tr.offsetTableOffset <= kHeaderSize || tr.offsetTableOffset > tableEnd) return std::nullopt;
  if (tr.objectCount > (tableEnd - tr.offsetTableOffset) / tr.offsetSize) return std::nullopt;
  return tr;
}

}  // namespace qr::bplist
