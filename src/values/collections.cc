#include <algorithm>
#include <stdexcept>

#include "values/array.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace qr {

Ref<Array> Array::copy() const { return qr::make<Array>(items_); }
Ref<MutableArray> Array::mutableCopy() const { return qr::make<MutableArray>(items_); }

bool Array::isEqual(const Object& other) const noexcept {
  if (this == &other) return true;
  if (other.kind() != TypeKind::Array) return false;
  const auto& o = static_cast<const Array&>(other);
  if (items_.size() != o.items_.size()) return false;
  for (size_t i = 0; i < items_.size(); ++i)
    if (!equal(items_[i], o.items_[i])) return false;
  return true;
}

std::string Array::description() const {
  std::string out = "(";
  for (size_t i = 0; i < items_.size(); ++i) {
    if (i) out += ", ";
    out += describe(items_[i].get());
  }
  return out + ")";
}

void MutableArray::insert(size_t index, Ref<Object> value) {
  if (index > items_.size()) throw std::out_of_range("array index");
  items_.insert(items_.begin() + static_cast<ptrdiff_t>(index), std::move(value));
}

void MutableArray::set(size_t index, Ref<Object> value) {
  if (index >= items_.size()) throw std::out_of_range("array index");
  items_[index] = std::move(value);
}

void MutableArray::removeAt(size_t index) {
  if (index >= items_.size()) throw std::out_of_range("array index");
  items_.erase(items_.begin() + static_cast<ptrdiff_t>(index));
}

namespace {
constexpr size_t kLinearLimit = 8;
constexpr uint32_t kTombstone = UINT32_MAX;

size_t keyHash(std::string_view key) {
  // Must agree with String::hash for the same text.
  if (isASCII(key)) return hashCodeUnits(key);
  std::u16string units;
  if (!decodeUTF8(key, units)) return 0;
  return hashCodeUnits(std::u16string_view(units));
}
}  // namespace

Dictionary::~Dictionary() = default;

Ref<Dictionary> Dictionary::build(std::vector<std::pair<Ref<Object>, Ref<Object>>> pairs) {
  return build(std::span(pairs));
}

Ref<Dictionary> Dictionary::build(std::span<std::pair<Ref<Object>, Ref<Object>>> pairs) {
  auto d = Ref<Dictionary>::adopt(new Dictionary());
  d->entries_.reserve(pairs.size());
  for (auto& [k, v] : pairs) d->setValue(std::move(k), std::move(v));
  return d;
}

Ref<Dictionary> Dictionary::copy() const {
  auto d = Ref<Dictionary>::adopt(new Dictionary());
  d->entries_.reserve(live_);
  forEach([&](const Object& k, const Object& v) {
    d->entries_.push_back(
        {Ref<Object>(const_cast<Object*>(&k)), Ref<Object>(const_cast<Object*>(&v)), k.hash()});
  });
  d->live_ = d->entries_.size();
  d->rebuildIndex();
  return d;
}

Ref<MutableDictionary> Dictionary::mutableCopy() const {
  auto d = qr::make<MutableDictionary>();
  d->reserve(live_);
  forEach([&](const Object& k, const Object& v) {
    d->set(Ref<Object>(const_cast<Object*>(&k)), Ref<Object>(const_cast<Object*>(&v)));
  });
  return d;
}

template <class Match>
size_t Dictionary::find(size_t hash, Match&& match) const noexcept {
  if (index_.empty()) {
    for (size_t i = 0; i < entries_.size(); ++i) {
      const Entry& e = entries_[i];
      if (e.key && e.hash == hash && match(*e.key)) return i;
    }
    return SIZE_MAX;
  }
  size_t mask = index_.size() - 1;
  for (size_t slot = hash & mask;; slot = (slot + 1) & mask) {
    uint32_t v = index_[slot];
    if (v == 0) return SIZE_MAX;
    if (v == kTombstone) continue;
    const Entry& e = entries_[v - 1];
    if (e.hash == hash && match(*e.key)) return v - 1;
  }
}

Object* Dictionary::get(const Object& key) const noexcept {
  size_t i = find(key.hash(), [&](const Object& k) { return k.isEqual(key); });
  return i == SIZE_MAX ? nullptr : entries_[i].value.get();
}

size_t Dictionary::findText(std::string_view key) const noexcept {
  auto matches = [&](const Object& k) {
    if (k.kind() != TypeKind::String) return false;
    const auto& s = static_cast<const String&>(k);
    if (s.isNarrow()) return s.narrow() == key;
    return s.utf8() == key;
  };
  if (index_.empty()) {
    // A short list is searched by the text alone: hashing it would cost more.
    for (size_t i = 0; i < entries_.size(); ++i)
      if (entries_[i].key && matches(*entries_[i].key)) return i;
    return SIZE_MAX;
  }
  return find(keyHash(key), matches);
}

Object* Dictionary::get(std::string_view key) const noexcept {
  size_t i = findText(key);
  return i == SIZE_MAX ? nullptr : entries_[i].value.get();
}

std::vector<Ref<Object>> Dictionary::keys() const {
  std::vector<Ref<Object>> out;
  out.reserve(live_);
  for (const Entry& e : entries_)
    if (e.key) out.push_back(e.key);
  return out;
}

void Dictionary::rebuildIndex() {
  index_.clear();
  if (live_ <= kLinearLimit) return;
  size_t size = 16;
  while (size < live_ * 2) size *= 2;
  index_.assign(size, 0);
  size_t mask = size - 1;
  for (size_t i = 0; i < entries_.size(); ++i) {
    if (!entries_[i].key) continue;
    size_t slot = entries_[i].hash & mask;
    while (index_[slot] != 0) slot = (slot + 1) & mask;
    index_[slot] = static_cast<uint32_t>(i + 1);
  }
}

void Dictionary::compact() {
  std::erase_if(entries_, [](const Entry& e) { return !e.key; });
  rebuildIndex();
}

void Dictionary::setValue(Ref<Object> key, Ref<Object> value) {
  if (!key || !value) throw std::invalid_argument("dictionary key and value must not be null");
  size_t h = key->hash();
  size_t i = find(h, [&](const Object& k) { return k.isEqual(*key); });
  if (i != SIZE_MAX) {
    entries_[i].value = std::move(value);
    return;
  }
  if (entries_.size() >= UINT32_MAX - 1) throw std::length_error("dictionary too large");
  entries_.push_back({std::move(key), std::move(value), h});
  ++live_;
  if (index_.empty()) {
    if (live_ > kLinearLimit) rebuildIndex();
    return;
  }
  // Keep the load (live entries and tombstones) under one half.
  if (entries_.size() * 2 > index_.size()) {
    if (entries_.size() > live_ * 2)
      compact();
    else
      rebuildIndex();
    return;
  }
  size_t mask = index_.size() - 1;
  size_t slot = h & mask;
  while (index_[slot] != 0 && index_[slot] != kTombstone) slot = (slot + 1) & mask;
  index_[slot] = static_cast<uint32_t>(entries_.size());
}

bool Dictionary::removeValue(const Object& key) {
  return removeAt(find(key.hash(), [&](const Object& k) { return k.isEqual(key); }));
}

bool Dictionary::removeText(std::string_view key) { return removeAt(findText(key)); }

bool Dictionary::removeAt(size_t i) {
  if (i == SIZE_MAX) return false;
  if (!index_.empty()) {
    size_t mask = index_.size() - 1;
    size_t slot = entries_[i].hash & mask;
    while (index_[slot] != i + 1) slot = (slot + 1) & mask;
    index_[slot] = kTombstone;
  }
  entries_[i].key.reset();
  entries_[i].value.reset();
  --live_;
  if (index_.empty() || entries_.size() > live_ * 2 + kLinearLimit) compact();
  return true;
}

void Dictionary::clear() noexcept {
  entries_.clear();
  index_.clear();
  live_ = 0;
}

bool Dictionary::isEqual(const Object& other) const noexcept {
  if (this == &other) return true;
  if (other.kind() != TypeKind::Dictionary) return false;
  const auto& o = static_cast<const Dictionary&>(other);
  if (live_ != o.live_) return false;
  for (const Entry& e : entries_) {
    if (!e.key) continue;
    if (!equal(e.value.get(), o.get(*e.key))) return false;
  }
  return true;
}

std::string Dictionary::description() const {
  std::string out = "{";
  bool first = true;
  forEach([&](const Object& k, const Object& v) {
    out += first ? "" : "; ";
    first = false;
    out += k.description() + " = " + v.description();
  });
  return out + "}";
}

void MutableDictionary::set(std::string_view key, Ref<Object> value) {
  set(Ref<Object>(String::make(key)), std::move(value));
}

bool MutableDictionary::remove(std::string_view key) { return removeText(key); }

}  // namespace qr
