// Reads "bplist00" files. With immutable results every object is decoded once
// and shared wherever it is referenced. Mutable containers cannot be shared (a
// change made through one path would show through every other), so they are
// built afresh for each reference, under a budget that keeps a small file
// from expanding without bound.
#include <algorithm>
#include <cstring>
#include <span>
#include <vector>

#include "plist/binary_trailer.h"
#include "plist/property_list.h"
#include "values/array.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/dictionary.h"
#include "values/number.h"
#include "values/string.h"

namespace qr {
namespace {

using bplist::readBigEndian;

// The high nibble of an object's marker byte.
enum Type : uint8_t {
  kSingleton = 0x0,  // null, false, true, fill
  kInteger = 0x1,
  kReal = 0x2,
  kDate = 0x3,
  kData = 0x4,
  kASCIIString = 0x5,
  kUTF16String = 0x6,
  kArray = 0xA,
  kDictionary = 0xD,
};

struct Header {
  uint8_t type;    // high nibble of the marker
  uint8_t info;    // low nibble: a size exponent or a short count
  uint64_t count;  // elements, bytes or code units, for the kinds that have a count
  const unsigned char* body;
};

bool isContainer(uint8_t type) { return type == kArray || type == kDictionary; }

class BinaryReader {
 public:
  BinaryReader(std::string_view file, const bplist::Trailer& trailer, Mutability mutability)
      : base_(reinterpret_cast<const unsigned char*>(file.data())),
        objectsEnd_(base_ + trailer.offsetTableOffset),
        trailer_(trailer),
        mutability_(mutability),
        slots_(trailer.objectCount),
        // A file whose containers are each referenced once has no more nodes
        // than references, and every reference takes at least a byte. Shared
        // immutable containers cost nothing to make, only to walk, so they
        // get more room.
        nodeBudget_(
            std::min<uint64_t>(4 * static_cast<uint64_t>(file.size()) +
                                   (mutability == Mutability::Immutable ? (1u << 20) : 4096),
                               kBudgetCeiling)),
        payloadBudget_(std::min<uint64_t>(64 * static_cast<uint64_t>(file.size()) + (16u << 20),
                                          kBudgetCeiling)) {}

  Ref<Object> read() {
    if (mutability_ == Mutability::Immutable) return shared(trailer_.topObject, 1);
    return fresh(trailer_.topObject, 1);
  }

 private:
  enum State : uint8_t { kUnseen, kBusy, kDone };
  // Budgets stay below this so that a slot's saturated counts fit 32 bits:
  // a slot per object, and small slots keep a large file's index compact.
  static constexpr uint64_t kBudgetCeiling = UINT32_MAX - 1;
  // What is known of one object; a finished immutable object is kept here for sharing.
  struct Slot {
    Ref<Object> value;
    uint32_t treeSize = 0;   // nodes the value has when walked as a tree, at most a budget + 1
    uint32_t treeBytes = 0;  // its string and data bytes, at most a budget + 1
    uint16_t height = 0;
    State state = kUnseen;
  };

  bool has(const unsigned char* p, uint64_t n) const {
    return p <= objectsEnd_ && n <= static_cast<uint64_t>(objectsEnd_ - p);
  }
  // Whether count units of the given size fit between the body and the offset table.
  bool bodyFits(const Header& h, uint64_t unit) const {
    return h.count <= static_cast<uint64_t>(objectsEnd_ - h.body) / unit;
  }

  bool header(uint64_t index, Header& h) const {
    const unsigned char* entry = base_ + trailer_.offsetTableOffset + index * trailer_.offsetSize;
    uint64_t offset = readBigEndian(entry, trailer_.offsetSize);
    if (offset < bplist::kHeaderSize || offset >= trailer_.offsetTableOffset) return false;
    const unsigned char* p = base_ + offset;
    h.type = *p >> 4;
    h.info = *p & 0x0F;
    h.count = h.info;
    h.body = p + 1;
    bool counted =
        h.type == kData || h.type == kASCIIString || h.type == kUTF16String || isContainer(h.type);
    if (counted && h.info == 0x0F) {
      // The count follows as an integer object of 1, 2, 4 or 8 bytes.
      if (!has(h.body, 1)) return false;
      uint8_t marker = *h.body;
      if ((marker >> 4) != kInteger || (marker & 0x0F) > 3) return false;
      size_t n = size_t{1} << (marker & 0x0F);
      if (!has(h.body + 1, n)) return false;
      h.count = readBigEndian(h.body + 1, n);
      h.body += 1 + n;
    }
    return true;
  }

  uint64_t reference(const Header& h, uint64_t i) const {
    return readBigEndian(h.body + i * trailer_.refSize, trailer_.refSize);
  }

  Ref<Object> integer(const Header& h) const {
    if (h.info <= 3) {
      size_t n = size_t{1} << h.info;
      if (!has(h.body, n)) return nullptr;
      // 1, 2 and 4 bytes are unsigned; 8 bytes are two's complement.
      return Number::integer(static_cast<int64_t>(readBigEndian(h.body, n)));
    }
    if (h.info == 4) {
      // 16 bytes of two's complement, as written for values from 2^63 up to 2^64 - 1.
      if (!has(h.body, 16)) return nullptr;
      uint64_t high = readBigEndian(h.body, 8);
      uint64_t low = readBigEndian(h.body + 8, 8);
      if (high == 0) return Number::unsignedInteger(low);
      if (high == UINT64_MAX && (low >> 63)) return Number::integer(static_cast<int64_t>(low));
    }
    return nullptr;
  }

  bool realValue(const Header& h, double& out) const {
    if (h.info == 2 && has(h.body, 4)) {
      uint32_t bits = static_cast<uint32_t>(readBigEndian(h.body, 4));
      float f;
      std::memcpy(&f, &bits, sizeof f);
      out = f;
      return true;
    }
    if (h.info == 3 && has(h.body, 8)) {
      uint64_t bits = readBigEndian(h.body, 8);
      std::memcpy(&out, &bits, sizeof out);
      return true;
    }
    return false;
  }

  // Decodes a value that holds no references, as an immutable object.
  Ref<Object> leaf(const Header& h) const {
    double d;
    switch (h.type) {
      case kSingleton:
        if (h.info == 0x8) return Boolean::falseValue();
        if (h.info == 0x9) return Boolean::trueValue();
        return nullptr;  // null and fill are not values
      case kInteger:
        return integer(h);
      case kReal:
        if (!realValue(h, d)) return nullptr;
        return Number::real(d);
      case kDate:
        if (h.info != 3 || !realValue(h, d)) return nullptr;
        return make<Date>(d);
      case kData:
        if (!bodyFits(h, 1)) return nullptr;
        return Data::copy(std::span<const uint8_t>(h.body, h.count));
      case kASCIIString: {
        if (!bodyFits(h, 1)) return nullptr;
        std::string_view text(reinterpret_cast<const char*>(h.body), h.count);
        if (!isASCII(text)) return nullptr;
        return String::fromUTF8(text);
      }
      case kUTF16String: {
        if (!bodyFits(h, 2)) return nullptr;
        std::u16string units(h.count, u'\0');
        for (uint64_t i = 0; i < h.count; ++i)
          units[i] = static_cast<char16_t>(readBigEndian(h.body + 2 * i, 2));
        return String::fromUTF16(units);
      }
      default:
        return nullptr;  // UIDs, sets and unknown markers are not property-list values
    }
  }

  // The immutable leaf at index, decoded on first use and shared after.
  Ref<Object> sharedLeaf(uint64_t index, const Header& h) {
    Slot& s = slots_[index];
    if (s.state == kDone) return s.value;
    s.value = leaf(h);
    if (!s.value) return nullptr;
    s.treeSize = 1;
    uint64_t bytes = h.type == kUTF16String                      ? 2 * h.count
                     : h.type == kData || h.type == kASCIIString ? h.count
                                                                 : 0;
    s.treeBytes = static_cast<uint32_t>(std::min(bytes, payloadBudget_ + 1));
    s.height = 1;
    s.state = kDone;
    return s.value;
  }

  Ref<Object> key(uint64_t index) {
    if (index >= trailer_.objectCount) return nullptr;
    Header h;
    if (!header(index, h)) return nullptr;
    if (h.type != kASCIIString && h.type != kUTF16String) return nullptr;
    return sharedLeaf(index, h);
  }

  // Builds the array or dictionary described by h, taking each value from
  // child(index, depth). Keys are always the shared immutable strings.
  template <class Child>
  Ref<Object> container(const Header& h, size_t depth, Child&& child) {
    bool mutableContainers = mutability_ != Mutability::Immutable;
    if (h.type == kArray) {
      if (!bodyFits(h, trailer_.refSize)) return nullptr;
      // Gathered on a stack shared by every level, as the pairs below are.
      size_t base = items_.size();
      for (uint64_t i = 0; i < h.count; ++i) {
        uint64_t r = reference(h, i);
        if (r >= trailer_.objectCount) return nullptr;
        auto v = child(r, depth + 1);
        if (!v) return nullptr;
        items_.push_back(std::move(v));
      }
      auto items = std::span(items_).subspan(base);
      Ref<Object> a = mutableContainers ? Ref<Object>(MutableArray::build(items))
                                        : Ref<Object>(Array::build(items));
      items_.resize(base);
      return a;
    }
    if (!bodyFits(h, 2 * trailer_.refSize)) return nullptr;
    // The pairs go on a stack shared by every level; a nested container takes
    // its own off again. After a failure the reader is of no further use.
    size_t base = pairs_.size();
    for (uint64_t i = 0; i < h.count; ++i) {
      auto k = key(reference(h, i));
      if (!k) return nullptr;
      uint64_t r = reference(h, h.count + i);
      if (r >= trailer_.objectCount) return nullptr;
      auto v = child(r, depth + 1);
      if (!v) return nullptr;
      pairs_.emplace_back(std::move(k), std::move(v));
    }
    auto pairs = std::span(pairs_).subspan(base);
    Ref<Object> d = mutableContainers ? Ref<Object>(MutableDictionary::build(pairs))
                                      : Ref<Object>(Dictionary::build(pairs));
    pairs_.resize(base);
    return d;
  }

  // The bytes of a dictionary's keys, once container() has read them.
  uint64_t keyBytes(const Header& h) const {
    uint64_t bytes = 0;
    for (uint64_t i = 0; i < h.count; ++i)
      bytes = std::min(bytes + slots_[reference(h, i)].treeBytes, payloadBudget_ + 1);
    return bytes;
  }

  // Immutable results: each object once, shared by every reference to it. The
  // size of the value as a tree, in nodes and in bytes, is still bounded, since
  // copying, comparing or writing it walks it as one.
  Ref<Object> shared(uint64_t index, size_t depth) {
    if (depth > kMaxPropertyListDepth) return nullptr;
    Slot& s = slots_[index];
    if (s.state == kBusy) return nullptr;  // a cycle
    if (s.state == kDone) return depth + s.height - 1 <= kMaxPropertyListDepth ? s.value : nullptr;
    Header h;
    if (!header(index, h)) return nullptr;
    if (!isContainer(h.type)) return sharedLeaf(index, h);
    s.state = kBusy;
    uint64_t size = 1 + (h.type == kDictionary ? h.count : 0);
    uint64_t bytes = 0;
    size_t height = 1;
    auto v = container(h, depth, [&](uint64_t child, size_t d) {
      auto c = shared(child, d);
      if (c) {
        size = std::min(size + slots_[child].treeSize, nodeBudget_ + 1);
        bytes = std::min(bytes + slots_[child].treeBytes, payloadBudget_ + 1);
        height = std::max<size_t>(height, slots_[child].height + 1);
      }
      return c;
    });
    if (v && h.type == kDictionary) bytes = std::min(bytes + keyBytes(h), payloadBudget_ + 1);
    if (!v || size > nodeBudget_ || bytes > payloadBudget_) return nullptr;
    s.value = std::move(v);
    s.treeSize = static_cast<uint32_t>(size);
    s.treeBytes = static_cast<uint32_t>(bytes);
    s.height = static_cast<uint16_t>(height);
    s.state = kDone;
    return s.value;
  }

  // Mutable results: containers (and, if asked, strings and data) are new for
  // each reference; every node made counts against the budget.
  Ref<Object> fresh(uint64_t index, size_t depth) {
    if (depth > kMaxPropertyListDepth) return nullptr;
    if (++nodes_ > nodeBudget_) return nullptr;
    Header h;
    if (!header(index, h)) return nullptr;
    if (!isContainer(h.type)) {
      auto v = sharedLeaf(index, h);
      if (!v || !chargePayload(slots_[index].treeBytes)) return nullptr;
      if (mutability_ != Mutability::MutableContainersAndLeaves) return v;
      return mutableLeaf(*v);
    }
    Slot& s = slots_[index];
    if (s.state == kBusy) return nullptr;  // a cycle
    if (h.type == kDictionary) {
      if (h.count > nodeBudget_ - nodes_) return nullptr;
      nodes_ += h.count;  // the keys
    }
    s.state = kBusy;
    auto v = container(h, depth, [&](uint64_t child, size_t d) { return fresh(child, d); });
    s.state = kUnseen;
    if (v && h.type == kDictionary && !chargePayload(keyBytes(h))) return nullptr;
    return v;
  }

  Ref<Object> mutableLeaf(Object& v) {
    if (v.kind() == TypeKind::String) return static_cast<String&>(v).mutableCopy();
    if (v.kind() == TypeKind::Data) {
      auto& d = static_cast<Data&>(v);
      return make<MutableData>(std::vector<uint8_t>(d.bytes(), d.bytes() + d.length()));
    }
    return Ref<Object>(&v);  // numbers, booleans and dates are immutable in every kind
  }

  bool chargePayload(uint64_t n) {
    if (n > payloadBudget_ - payload_) return false;
    payload_ += n;
    return true;
  }

  const unsigned char* base_;
  const unsigned char* objectsEnd_;
  bplist::Trailer trailer_;
  Mutability mutability_;
  std::vector<Slot> slots_;
  std::vector<std::pair<Ref<Object>, Ref<Object>>> pairs_;
  std::vector<Ref<Object>> items_;
  uint64_t nodeBudget_;
  uint64_t payloadBudget_;
  uint64_t nodes_ = 0;
  uint64_t payload_ = 0;
};

}  // namespace

Ref<Object> readBinaryPropertyList(std::string_view bytes, Mutability mutability) {
  auto trailer = bplist::readTrailer(bytes);
  if (!trailer) return nullptr;
  return BinaryReader(bytes, *trailer, mutability).read();
}

}  // namespace qr
