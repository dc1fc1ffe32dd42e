#include "values/string.h"

#include <algorithm>
#include <cstring>
#include <new>
#include <stdexcept>

namespace qr {
namespace {

// An immutable string and its code units in one allocation, so that a parsed
// property list of a million short strings costs one block per string.
class StoredString final : public String {
 public:
  static Ref<String> create(const void* units, size_t length, bool wide) {
    if (length > UINT32_MAX) throw std::length_error("string too long");
    size_t bytes = length * (wide ? sizeof(char16_t) : 1);
    void* block = ::operator new(sizeof(StoredString) + bytes + 1);
    auto* s = new (block) StoredString();
    char* tail = reinterpret_cast<char*>(s + 1);
    if (bytes) std::memcpy(tail, units, bytes);
    tail[bytes] = 0;
    s->setStorage(tail, length, wide);
    return Ref<String>::adopt(s);
  }

  Ref<String> copy() const override { return Ref<String>(const_cast<StoredString*>(this)); }

 protected:
  void dispose() const noexcept override { destroyInBlock(); }

 private:
  StoredString() = default;
};

bool allNarrow(std::u16string_view units) noexcept {
  for (char16_t c : units)
    if (c >= 0x80) return false;
  return true;
}

Ref<String> fromKnownUnits(std::u16string_view units) {
  if (!allNarrow(units)) return StoredString::create(units.data(), units.size(), true);
  std::string narrow(units.size(), '\0');
  for (size_t i = 0; i < units.size(); ++i) narrow[i] = static_cast<char>(units[i]);
  return StoredString::create(narrow.data(), narrow.size(), false);
}

}  // namespace

bool isASCII(std::string_view bytes) noexcept {
  // A word at a time: every parser asks this of every string it reads.
  const char* p = bytes.data();
  size_t n = bytes.size();
  uint64_t seen = 0;
  for (; n >= 8; p += 8, n -= 8) {
    uint64_t word;
    std::memcpy(&word, p, 8);
    seen |= word;
  }
  for (; n > 0; ++p, --n) seen |= static_cast<unsigned char>(*p);
  return (seen & 0x8080808080808080ull) == 0;
}

bool decodeUTF8(std::string_view in, std::u16string& out) {
  out.clear();
  out.reserve(in.size());
  const auto* p = reinterpret_cast<const unsigned char*>(in.data());
  const auto* end = p + in.size();
  while (p < end) {
    unsigned c = *p;
    if (c < 0x80) {
      out.push_back(static_cast<char16_t>(c));
      ++p;
      continue;
    }
    int extra;
    uint32_t cp, min;
    if ((c & 0xE0) == 0xC0) {
      extra = 1, cp = c & 0x1F, min = 0x80;
    } else if ((c & 0xF0) == 0xE0) {
      extra = 2, cp = c & 0x0F, min = 0x800;
    } else if ((c & 0xF8) == 0xF0) {
      extra = 3, cp = c & 0x07, min = 0x10000;
    } else {
      return false;
    }
    if (end - p <= extra) return false;
    for (int i = 1; i <= extra; ++i) {
      if ((p[i] & 0xC0) != 0x80) return false;
      cp = (cp << 6) | (p[i] & 0x3F);
    }
    if (cp < min || cp > 0x10FFFF || (cp >= 0xD800 && cp <= 0xDFFF)) return false;
    if (cp >= 0x10000) {
      cp -= 0x10000;
      out.push_back(static_cast<char16_t>(0xD800 + (cp >> 10)));
      out.push_back(static_cast<char16_t>(0xDC00 + (cp & 0x3FF)));
    } else {
      out.push_back(static_cast<char16_t>(cp));
    }
    p += extra + 1;
  }
  return true;
}

void encodeUTF8(std::u16string_view units, std::string& out) {
  out.reserve(out.size() + units.size());
  for (size_t i = 0; i < units.size(); ++i) {
    uint32_t cp = units[i];
    if (cp >= 0xD800 && cp <= 0xDBFF && i + 1 < units.size() && units[i + 1] >= 0xDC00 &&
        units[i + 1] <= 0xDFFF) {
      cp = 0x10000 + ((cp - 0xD800) << 10) + (units[i + 1] - 0xDC00);
      ++i;
    } else if (cp >= 0xD800 && cp <= 0xDFFF) {
      cp = 0xFFFD;
    }
    if (cp < 0x80) {
      out.push_back(static_cast<char>(cp));
    } else if (cp < 0x800) {
      out.push_back(static_cast<char>(0xC0 | (cp >> 6)));
      out.push_back(static_cast<char>(0x80 | (cp & 0x3F)));
    } else if (cp < 0x10000) {
      out.push_back(static_cast<char>(0xE0 | (cp >> 12)));
      out.push_back(static_cast<char>(0x80 | ((cp >> 6) & 0x3F)));
      out.push_back(static_cast<char>(0x80 | (cp & 0x3F)));
    } else {
      out.push_back(static_cast<char>(0xF0 | (cp >> 18)));
      out.push_back(static_cast<char>(0x80 | ((cp >> 12) & 0x3F)));
      out.push_back(static_cast<char>(0x80 | ((cp >> 6) & 0x3F)));
      out.push_back(static_cast<char>(0x80 | (cp & 0x3F)));
    }
  }
}

Ref<String> String::fromUTF8(std::string_view utf8) {
  if (isASCII(utf8)) return StoredString::create(utf8.data(), utf8.size(), false);
  std::u16string units;
  if (!decodeUTF8(utf8, units)) return nullptr;
  return fromKnownUnits(units);
}

Ref<String> String::fromUTF16(std::u16string_view units) { return fromKnownUnits(units); }

Ref<String> String::make(std::string_view utf8) {
  if (auto s = fromUTF8(utf8)) return s;
  // Replace each ill-formed byte; only reached for text that broke a promise.
  std::u16string units;
  std::u16string piece;
  size_t i = 0;
  while (i < utf8.size()) {
    size_t len = 1;
    unsigned char c = static_cast<unsigned char>(utf8[i]);
    if (c >= 0xF0)
      len = 4;
    else if (c >= 0xE0)
      len = 3;
    else if (c >= 0xC0)
      len = 2;
    if (i + len <= utf8.size() && decodeUTF8(utf8.substr(i, len), piece)) {
      units += piece;
      i += len;
    } else {
      units.push_back(0xFFFD);
      ++i;
    }
  }
  return fromKnownUnits(units);
}

Ref<String> String::empty() {
  static String* const shared = immortal(StoredString::create("", 0, false).leak());
  return Ref<String>(shared);
}

std::u16string String::utf16() const {
  if (wide_) return std::u16string(wide());
  std::u16string out(length_, u'\0');
  auto n = narrow();
  for (size_t i = 0; i < n.size(); ++i) out[i] = static_cast<unsigned char>(n[i]);
  return out;
}

std::string String::utf8() const {
  if (!wide_) return std::string(narrow());
  std::string out;
  encodeUTF8(wide(), out);
  return out;
}

Ref<String> String::substring(size_t start, size_t count) const {
  start = std::min<size_t>(start, length_);
  count = std::min<size_t>(count, length_ - start);
  if (!wide_) return StoredString::create(narrow().data() + start, count, false);
  return fromKnownUnits(wide().substr(start, count));
}

int String::compare(const String& other) const noexcept {
  if (!wide_ && !other.wide_) {
    int r = narrow().compare(other.narrow());
    return (r > 0) - (r < 0);
  }
  size_t n = std::min(length_, other.length_);
  for (size_t i = 0; i < n; ++i) {
    char16_t a = at(i), b = other.at(i);
    if (a != b) return a < b ? -1 : 1;
  }
  return (length_ > other.length_) - (length_ < other.length_);
}

bool String::equals(std::string_view ascii) const noexcept {
  if (ascii.size() != length_) return false;
  if (!wide_) return narrow() == ascii;
  for (size_t i = 0; i < ascii.size(); ++i)
    if (at(i) != static_cast<unsigned char>(ascii[i])) return false;
  return true;
}

bool String::hasPrefix(const String& prefix) const noexcept {
  if (prefix.length_ > length_) return false;
  for (size_t i = 0; i < prefix.length_; ++i)
    if (at(i) != prefix.at(i)) return false;
  return true;
}

bool String::hasPrefix(std::string_view ascii) const noexcept {
  if (ascii.size() > length_) return false;
  for (size_t i = 0; i < ascii.size(); ++i)
    if (at(i) != static_cast<unsigned char>(ascii[i])) return false;
  return true;
}

Ref<MutableString> String::mutableCopy() const { return qr::make<MutableString>(*this); }

Ref<String> String::copy() const {
  return wide_ ? StoredString::create(data_, length_, true)
               : StoredString::create(data_, length_, false);
}

bool String::isEqual(const Object& other) const noexcept {
  if (this == &other) return true;
  if (other.kind() != TypeKind::String) return false;
  const auto& o = static_cast<const String&>(other);
  if (length_ != o.length_) return false;
  if (!wide_ && !o.wide_) return std::memcmp(data_, o.data_, length_) == 0;
  return compare(o) == 0;
}

size_t String::hash() const noexcept {
  size_t h = hash_.load(std::memory_order_relaxed);
  if (h == 0) {
    h = wide_ ? hashCodeUnits(wide()) : hashCodeUnits(narrow());
    hash_.store(h, std::memory_order_relaxed);
  }
  return h;
}

void MutableString::widen() {
  if (isWide_) return;
  wide_.assign(narrow_.begin(), narrow_.end());
  narrow_.clear();
  narrow_.shrink_to_fit();
  isWide_ = true;
}

void MutableString::sync() noexcept {
  if (isWide_)
    setStorage(wide_.data(), wide_.size(), true);
  else
    setStorage(narrow_.data(), narrow_.size(), false);
}

void MutableString::append(const String& text) {
  if (!isWide_ && text.isNarrow()) {
    narrow_ += text.narrow();
  } else {
    widen();
    if (text.isNarrow())
      wide_.append(text.narrow().begin(), text.narrow().end());
    else
      wide_ += text.wide();
  }
  sync();
}

void MutableString::append(std::u16string_view units) {
  if (!isWide_ && allNarrow(units)) {
    for (char16_t c : units) narrow_.push_back(static_cast<char>(c));
  } else {
    widen();
    wide_ += units;
  }
  sync();
}

void MutableString::appendUTF8(std::string_view utf8) {
  if (!isWide_ && isASCII(utf8)) {
    narrow_ += utf8;
    sync();
    return;
  }
  append(*String::make(utf8));
}

void MutableString::replace(size_t start, size_t count, const String& with) {
  start = std::min<size_t>(start, length());
  count = std::min<size_t>(count, length() - start);
  if (!isWide_ && with.isNarrow()) {
    narrow_.replace(start, count, with.narrow());
  } else {
    widen();
    wide_.replace(start, count, with.utf16());
  }
  sync();
}

void MutableString::setString(const String& text) {
  if (&text == this) return;
  narrow_.clear();
  wide_.clear();
  isWide_ = false;
  append(text);
}

Ref<String> MutableString::copy() const {
  return isWide_ ? fromKnownUnits(wide_) : String::fromUTF8(narrow_);
}

}  // namespace qr
