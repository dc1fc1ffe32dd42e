// The binary "bplist00" writer, for frames on a pipe more than for files.
//
// One walk over the value numbers every object (the top one first) and notes
// each container's references; equal keys, and equal short strings (kinds,
// makes, versions), are numbered once, which is most of the saving on
// cache-like data and spares the reader as many objects. The count then fixes
// the size of a reference, and so the exact size of the file: the second pass
// is a plain loop over the numbered objects into one buffer of that size.
#include <algorithm>
#include <bit>
#include <cstdint>
#include <cstring>
#include <iterator>
#include <optional>
#include <string>
#include <vector>

#include "plist/binary_trailer.h"
#include "plist/property_list.h"
#include "plist/sharing_table.h"
#include "values/array.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/dictionary.h"
#include "values/number.h"
#include "values/string.h"

namespace qr {
namespace {

// Marker bytes: the type in the high nibble.
enum : uint8_t {
  kFalse = 0x08,
  kTrue = 0x09,
  kInteger = 0x10,
  kReal8 = 0x23,
  kDate8 = 0x33,
  kData = 0x40,
  kASCIIString = 0x50,
  kUTF16String = 0x60,
  kArray = 0xA0,
  kDictionary = 0xD0,
};

// The exponent of the fewest bytes, of 1, 2, 4 and 8, that hold v.
uint8_t sizeExponent(uint64_t v) noexcept {
  return v <= 0xFF ? 0 : v <= 0xFFFF ? 1 : v <= 0xFFFFFFFF ? 2 : 3;
}
size_t minimalSize(uint64_t v) noexcept { return size_t{1} << sizeExponent(v); }

char* putBigEndian(char* p, uint64_t v, size_t n) noexcept {
  switch (n) {
    case 1:
      *p = static_cast<char>(v);
      return p + 1;
    case 2: {
      uint16_t be = __builtin_bswap16(static_cast<uint16_t>(v));
      std::memcpy(p, &be, 2);
      return p + 2;
    }
    case 4: {
      uint32_t be = __builtin_bswap32(static_cast<uint32_t>(v));
      std::memcpy(p, &be, 4);
      return p + 4;
    }
    default: {
      uint64_t be = __builtin_bswap64(v);
      std::memcpy(p, &be, 8);
      return p + 8;
    }
  }
}

// A marker whose low nibble is a count, or 0xF and the count as an integer after it.
size_t countedMarkerSize(uint64_t count) noexcept {
  return count < 15 ? 1 : 2 + minimalSize(count);
}
char* putCountedMarker(char* p, uint8_t type, uint64_t count) noexcept {
  if (count < 15) {
    *p = static_cast<char>(type | count);
    return p + 1;
  }
  *p++ = static_cast<char>(type | 0x0F);
  uint8_t e = sizeExponent(count);
  *p++ = static_cast<char>(kInteger | e);
  return putBigEndian(p, count, size_t{1} << e);
}

// The reader takes 1, 2 and 4 bytes as unsigned and 8 as two's complement;
// values above INT64_MAX take the 16-byte form.
size_t integerSize(const Number& n) noexcept {
  if (n.isUnsigned()) return 17;
  int64_t v = n.int64Value();
  return v < 0 ? 9 : 1 + minimalSize(static_cast<uint64_t>(v));
}

bool allASCII(std::u16string_view units) noexcept {
  char16_t any = 0;
  for (char16_t u : units) any |= u;  // no early exit, so that it vectorizes
  return any < 0x80;
}

size_t stringSize(const String& s) noexcept {
  bool ascii = s.isNarrow() || allASCII(s.wide());
  return countedMarkerSize(s.length()) + (ascii ? 1 : 2) * size_t{s.length()};
}

// The bytes of a value that holds no references; 0 for containers and for
// anything that is not a property-list value.
size_t leafSize(const Object& v, TypeKind kind) noexcept {
  switch (kind) {
    case TypeKind::String:
      return stringSize(static_cast<const String&>(v));
    case TypeKind::Number: {
      const auto& n = static_cast<const Number&>(v);
      return n.isReal() ? 9 : integerSize(n);
    }
    case TypeKind::Boolean:
      return 1;
    case TypeKind::Date:
      return 9;
    case TypeKind::Data: {
      size_t n = static_cast<const Data&>(v).length();
      return countedMarkerSize(n) + n;
    }
    default:
      return 0;
  }
}

class BinaryWriter {
 public:
  // The object's number; none for a value that cannot be written.
  std::optional<size_t> collect(const Object& v, size_t depth);
  std::optional<std::string> write();

 private:
  struct StringSlot {
    uint64_t hash;
    size_t item;  // 0 for an empty slot: a string is never the top object
  };
  struct SeenString {
    const String* string;
    size_t item;
  };

  // Longer strings are rarely repeated, and hashing them all would cost more
  // than their sharing saves.
  static constexpr size_t kSharedStringLength = 32;

  size_t add(const Object& v, size_t bytes);
  size_t shared(const String& s);

  std::vector<const Object*> items_;  // in the order they are numbered
  // For each container in turn, its count as collected, then its references.
  std::vector<size_t> refs_;
  size_t refCount_ = 0;
  std::vector<StringSlot> strings_;
  size_t stringCount_ = 0;
  // Strings read from a file are one shared object each; remembering recent
  // ones by address saves hashing them again.
  SeenString seen_[64] = {};
  size_t bytes_ = 0;  // of every object but its references
  // Of the last object numbered, without its references: the table offset
  // less this bounds where that object starts.
  size_t lastSize_ = 0;
};

size_t BinaryWriter::add(const Object& v, size_t bytes) {
  items_.push_back(&v);
  bytes_ += bytes;
  lastSize_ = bytes;
  return items_.size() - 1;
}

// The number of the string's first occurrence, from an open-addressing table
// on a quick hash of its stored units. Sharing only saves room: text made to
// collide is numbered anew rather than searched for at length, and equal
// strings stored one narrow, one wide are simply written twice.
size_t BinaryWriter::shared(const String& s) {
  SeenString& seen = seen_[(reinterpret_cast<uintptr_t>(&s) >> 4) % std::size(seen_)];
  if (seen.string == &s) return seen.item;
  if (2 * (stringCount_ + 1) > strings_.size())
    rehashTable(strings_, std::max<size_t>(64, 2 * strings_.size()),
                [](const StringSlot& slot) { return slot.item != 0; });
  std::string_view units =
      s.isNarrow()
          ? s.narrow()
          : std::string_view(reinterpret_cast<const char*>(s.wide().data()), 2 * s.wide().size());
  uint64_t h = quickTextHash(units);
  size_t mask = strings_.size() - 1, item = 0;
  for (size_t i = h & mask, probes = 0; probes < kMaxSharingProbes; i = (i + 1) & mask, ++probes) {
    StringSlot& slot = strings_[i];
    if (!slot.item) {
      slot = {h, add(s, stringSize(s))};
      ++stringCount_;
    } else if (slot.hash != h || !items_[slot.item]->isEqual(s)) {
      continue;
    }
    item = slot.item;
    break;
  }
  if (!item) item = add(s, stringSize(s));  // not shared
  seen = {&s, item};
  return item;
}

std::optional<size_t> BinaryWriter::collect(const Object& v, size_t depth) {
  if (depth > kMaxPropertyListDepth) return std::nullopt;
  TypeKind kind = v.kind();
  if (kind == TypeKind::Array) {
    const auto& a = static_cast<const Array&>(v);
    size_t n = a.count();
    size_t number = add(v, countedMarkerSize(n));
    refs_.push_back(n);
    size_t first = refs_.size();
    refs_.resize(first + n);
    refCount_ += n;
    for (size_t i = 0; i < n; ++i) {
      const Object* item = a.at(i);
      auto r = item ? collect(*item, depth + 1) : std::nullopt;
      if (!r) return std::nullopt;
      refs_[first + i] = *r;
    }
    return number;
  }
  if (kind == TypeKind::Dictionary) {
    const auto& d = static_cast<const Dictionary&>(v);
    size_t n = d.count(), i = 0;
    size_t number = add(v, countedMarkerSize(n));
    refs_.push_back(n);
    size_t first = refs_.size();
    refs_.resize(first + 2 * n);  // the keys, then the values
    refCount_ += 2 * n;
    bool ok = true;
    d.forEach([&](const Object& k, const Object& value) {
      if (!ok || i == n || k.kind() != TypeKind::String) {
        ok = false;
        return;
      }
      refs_[first + i] = shared(static_cast<const String&>(k));
      auto r = collect(value, depth + 1);
      ok = r.has_value();
      if (ok) refs_[first + n + i++] = *r;
    });
    if (!ok || i != n) return std::nullopt;
    return number;
  }
  // The top object is number 0, which the table takes for an empty slot.
  if (kind == TypeKind::String && depth > 1 &&
      static_cast<const String&>(v).length() <= kSharedStringLength)
    return shared(static_cast<const String&>(v));
  size_t size = leafSize(v, kind);
  if (size == 0) return std::nullopt;  // URLs, UUIDs and every other object
  return add(v, size);
}

std::optional<std::string> BinaryWriter::write() {
  size_t objects = items_.size();
  size_t refSize = minimalSize(objects - 1);
  size_t tableOffset = bplist::kHeaderSize + bytes_ + refCount_ * refSize;
  size_t offsetSize = minimalSize(tableOffset - lastSize_);
  std::string out;
  out.resize(tableOffset + objects * offsetSize + bplist::kTrailerSize);
  char* const base = out.data();
  char* const objectsEnd = base + tableOffset;
  char* table = objectsEnd;
  char* p = base;
  std::memcpy(p, "bplist00", bplist::kHeaderSize);
  p += bplist::kHeaderSize;
  // Each object is sized again from what it holds now and must fit in the
  // room left: a string or data changed by another thread since the first
  // pass fails the write rather than overrun it.
  const size_t* ref = refs_.data();
  for (const Object* object : items_) {
    table = putBigEndian(table, static_cast<uint64_t>(p - base), offsetSize);
    const Object& v = *object;
    TypeKind kind = v.kind();
    bool container = kind == TypeKind::Array || kind == TypeKind::Dictionary;
    size_t count = container ? *ref++ : 0;
    size_t refs = (kind == TypeKind::Dictionary ? 2 : 1) * count;
    size_t size = container ? countedMarkerSize(count) + refs * refSize : leafSize(v, kind);
    if (size > static_cast<size_t>(objectsEnd - p)) return std::nullopt;
    switch (kind) {
      case TypeKind::String: {
        const auto& s = static_cast<const String&>(v);
        size_t length = s.length();
        if (s.isNarrow()) {
          p = putCountedMarker(p, kASCIIString, length);
          std::memcpy(p, s.narrow().data(), length);
          p += length;
        } else if (size == countedMarkerSize(length) + length) {  // wide storage, ASCII text
          p = putCountedMarker(p, kASCIIString, length);
          for (char16_t u : s.wide()) *p++ = static_cast<char>(u);
        } else {
          // Units as they are, lone surrogates too: the reader takes them back unchanged.
          p = putCountedMarker(p, kUTF16String, length);
          for (char16_t u : s.wide()) {
            *p++ = static_cast<char>(u >> 8);
            *p++ = static_cast<char>(u);
          }
        }
        break;
      }
      case TypeKind::Number: {
        const auto& n = static_cast<const Number&>(v);
        if (n.isReal()) {
          *p++ = static_cast<char>(kReal8);
          p = putBigEndian(p, std::bit_cast<uint64_t>(n.doubleValue()), 8);
        } else if (n.isUnsigned()) {
          *p++ = static_cast<char>(kInteger | 4);
          p = putBigEndian(putBigEndian(p, 0, 8), n.uint64Value(), 8);
        } else {
          int64_t i = n.int64Value();
          uint8_t e = i < 0 ? 3 : sizeExponent(static_cast<uint64_t>(i));
          *p++ = static_cast<char>(kInteger | e);
          p = putBigEndian(p, static_cast<uint64_t>(i), size_t{1} << e);
        }
        break;
      }
      case TypeKind::Boolean:
        *p++ = static_cast<char>(static_cast<const Boolean&>(v).value() ? kTrue : kFalse);
        break;
      case TypeKind::Date:
        *p++ = static_cast<char>(kDate8);
        p = putBigEndian(
            p, std::bit_cast<uint64_t>(static_cast<const Date&>(v).secondsSinceReference()), 8);
        break;
      case TypeKind::Data: {
        const auto& d = static_cast<const Data&>(v);
        p = putCountedMarker(p, kData, d.length());
        if (d.length()) std::memcpy(p, d.bytes(), d.length());
        p += d.length();
        break;
      }
      default:
        p = putCountedMarker(p, kind == TypeKind::Dictionary ? kDictionary : kArray, count);
        for (const size_t* end = ref + refs; ref < end; ++ref) p = putBigEndian(p, *ref, refSize);
        break;
    }
  }
  if (p != objectsEnd) return std::nullopt;
  // The trailer: five unused bytes, the sort version, the two sizes, the
  // object count, the top object (the first) and where the table starts.
  std::memset(table, 0, 6);
  table[6] = static_cast<char>(offsetSize);
  table[7] = static_cast<char>(refSize);
  table = putBigEndian(table + 8, objects, 8);
  table = putBigEndian(table, 0, 8);
  putBigEndian(table, tableOffset, 8);
  return out;
}

}  // namespace

std::optional<std::string> writeBinaryPropertyList(const Object& value) {
  try {
    BinaryWriter writer;
    if (!writer.collect(value, 1)) return std::nullopt;
    return writer.write();
  } catch (const std::bad_alloc&) {
    return std::nullopt;
  }
}

}  // namespace qr
