#include "plist/xml_string_table.h"

#include <cstring>

#include "plist/sharing_table.h"

namespace qr::xmlplist {
StringTable::~StringTable() {
  for (Slot& s : slots_)
    if (s.string) s.string->release();
}

size_t StringTable::recentIndex(std::string_view text) noexcept {
  size_t n = text.size();
  if (n == 0) return 0;
  auto at = [&](size_t i) { return static_cast<unsigned char>(text[i]); };
  return (n * 7 + at(n - 1) * 31 + at(n / 2) * 131 + at(0)) % kRecent;
}

Ref<String> StringTable::intern(std::string_view ascii) {
  String*& recent = recent_[recentIndex(ascii)];
  if (recent && recent->narrow() == ascii) return Ref<String>(recent);
  if (!isASCII(ascii)) return nullptr;
  if (slots_.empty()) grow();
  uint64_t h = quickTextHash(ascii);
  size_t mask = slots_.size() - 1;
  size_t i = h & mask;
  for (size_t probes = 0; probes < kMaxSharingProbes; ++probes, i = (i + 1) & mask) {
    Slot& slot = slots_[i];
    if (!slot.string) break;
    if (slot.hash == h && slot.string->narrow() == ascii) {
      recent = slot.string;
      return Ref<String>(slot.string);
    }
  }
  Ref<String> s = String::fromUTF8(ascii);
  if (slots_[i].string || used_ >= capacity_) return s;  // not shared
  slots_[i] = {h, Ref<String>(s).leak()};
  recent = slots_[i].string;
  if (++used_ * 2 > slots_.size()) grow();
  return s;
}

void StringTable::grow() {
  rehashTable(slots_, slots_.empty() ? 256 : 2 * slots_.size(),
              [](const Slot& s) { return s.string != nullptr; });
}

}  // namespace qr::xmlplist
