#include "platform/xml_key_table.h"

namespace qr::xmlplist {

Ref<String> KeyTable::intern(std::string_view utf8) {
  // Only ASCII keys are shared: their stored form is the text itself, so a
  // lookup needs no decoding. Other keys are rare and get their own object.
  if (!isASCII(utf8)) return String::fromUTF8(utf8);
  if ((used_ + 1) * 2 > slots_.size()) grow();
  size_t h = hashCodeUnits(utf8);
  size_t mask = slots_.size() - 1;
  for (size_t i = h & mask;; i = (i + 1) & mask) {
    Slot& slot = slots_[i];
    if (!slot.key) {
      slot.hash = h;
      slot.key = String::fromUTF8(utf8);
      ++used_;
      return slot.key;
    }
    if (slot.hash == h && slot.key->narrow() == utf8) return slot.key;
  }
}

void KeyTable::grow() {
  std::vector<Slot> old = std::move(slots_);
  slots_.assign(old.empty() ? 64 : old.size() * 2, Slot());
  size_t mask = slots_.size() - 1;
  for (Slot& s : old) {
    if (!s.key) continue;
    size_t i = s.hash & mask;
    while (slots_[i].key) i = (i + 1) & mask;
    slots_[i] = std::move(s);
  }
}

}  // namespace qr::xmlplist
