#include <algorithm>
#include <iterator>
#include <memory>
#include <new>
#include <stdexcept>

#include "values/array.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace qr {

Array::~Array() {
  if (ownsBlock_) std::destroy_n(items_, count_);
}

Ref<Array> Array::build(std::vector<Ref<Object>> items) { return build(std::span(items)); }

Ref<Array> Array::build(std::span<Ref<Object>> items) {
  static_assert(sizeof(Array) % alignof(Ref<Object>) == 0);
  void* block = ::operator new(sizeof(Array) + items.size() * sizeof(Ref<Object>));
  auto a = Ref<Array>::adopt(new (block) Array());
  a->ownsBlock_ = true;
  a->items_ = reinterpret_cast<Ref<Object>*>(static_cast<char*>(block) + sizeof(Array));
  for (auto& item : items) new (a->items_ + a->count_++) Ref<Object>(std::move(item));
  return a;
}

Ref<Array> Array::copy() const {
  std::vector<Ref<Object>> items(begin(), end());
  return build(std::span(items));
}
Ref<MutableArray> Array::mutableCopy() const {
  return qr::make<MutableArray>(std::vector<Ref<Object>>(begin(), end()));
}

bool Array::isEqual(const Object& other) const noexcept {
  if (this == &other) return true;
  if (other.kind() != TypeKind::Array) return false;
  const auto& o = static_cast<const Array&>(other);
  if (count_ != o.count_) return false;
  for (size_t i = 0; i < count_; ++i)
    if (!equal(items_[i], o.items_[i])) return false;
  return true;
}

std::string Array::description() const {
  std::string out = "(";
  for (size_t i = 0; i < count_; ++i) {
    if (i) out += ", ";
    out += describe(items_[i].get());
  }
  return out + ")";
}

Ref<MutableArray> MutableArray::build(std::span<Ref<Object>> items) {
  return qr::make<MutableArray>(std::vector<Ref<Object>>(std::make_move_iterator(items.begin()),
                                                         std::make_move_iterator(items.end())));
}

void MutableArray::insert(size_t index, Ref<Object> value) {
  if (index > store_.size()) throw std::out_of_range("array index");
  store_.insert(store_.begin() + static_cast<ptrdiff_t>(index), std::move(value));
  sync();
}

void MutableArray::set(size_t index, Ref<Object> value) {
  if (index >= store_.size()) throw std::out_of_range("array index");
  store_[index] = std::move(value);
}

void MutableArray::removeAt(size_t index) {
  if (index >= store_.size()) throw std::out_of_range("array index");
  store_.erase(store_.begin() + static_cast<ptrdiff_t>(index));
  sync();
}

namespace {
constexpr size_t kLinearLimit = 8;
constexpr uint32_t kTombstone = UINT32_MAX;
// Positions and index sizes are 32-bit; no property list comes near this.
constexpr size_t kMaxEntries = size_t(1) << 30;

size_t keyHash(std::string_view key) {
  // Must agree with String::hash for the same text.
  if (isASCII(key)) return hashCodeUnits(key);
  std::u16string units;
  if (!decodeUTF8(key, units)) return 0;
  return hashCodeUnits(std::u16string_view(units));
}

// Twice the live entries at least, so that a probe soon meets an empty slot.
size_t indexSizeFor(size_t live) {
  size_t size = 16;
  while (size < live * 2) size *= 2;
  return size;
}

void placeInIndex(uint32_t* index, size_t size, size_t hash, size_t position) {
  size_t mask = size - 1;
  size_t slot = hash & mask;
  while (index[slot] != 0 && index[slot] != kTombstone) slot = (slot + 1) & mask;
  index[slot] = static_cast<uint32_t>(position + 1);
}

void checkPair(const Ref<Object>& key, const Ref<Object>& value) {
  if (!key || !value) throw std::invalid_argument("dictionary key and value must not be null");
}
}  // namespace

Dictionary::~Dictionary() {
  if (ownsBlock_) std::destroy_n(entries_, used_);
}

Ref<Dictionary> Dictionary::build(std::vector<std::pair<Ref<Object>, Ref<Object>>> pairs) {
  return build(std::span(pairs));
}

Ref<Dictionary> Dictionary::build(std::span<std::pair<Ref<Object>, Ref<Object>>> pairs) {
  size_t n = pairs.size();
  if (n > kMaxEntries) throw std::length_error("dictionary too large");
  // Sized for every pair: repeated keys, which leave some room unused, are rare.
  size_t indexSize = n > kLinearLimit ? indexSizeFor(n) : 0;
  static_assert(sizeof(Dictionary) % alignof(Entry) == 0 && alignof(Entry) >= alignof(uint32_t));
  void* block =
      ::operator new(sizeof(Dictionary) + n * sizeof(Entry) + indexSize * sizeof(uint32_t));
  // Adopted at once: a pair that throws below frees what was placed so far.
  auto d = Ref<Dictionary>::adopt(new (block) Dictionary());
  d->ownsBlock_ = true;
  d->entries_ = reinterpret_cast<Entry*>(static_cast<char*>(block) + sizeof(Dictionary));
  if (indexSize) {
    d->index_ = reinterpret_cast<uint32_t*>(d->entries_ + n);
    std::fill_n(d->index_, indexSize, 0u);
    d->indexSize_ = static_cast<uint32_t>(indexSize);
  }
  for (auto& pair : pairs) {
    Ref<Object>& key = pair.first;
    Ref<Object>& value = pair.second;
    checkPair(key, value);
    size_t h = key->hash();
    size_t i = d->find(h, [&](const Object& k) { return k.isEqual(*key); });
    if (i != SIZE_MAX) {
      d->entries_[i].value = std::move(value);
      continue;
    }
    new (d->entries_ + d->used_) Entry{std::move(key), std::move(value), h};
    if (indexSize) placeInIndex(d->index_, indexSize, h, d->used_);
    ++d->used_;
    ++d->live_;
  }
  return d;
}

Ref<Dictionary> Dictionary::copy() const {
  std::vector<std::pair<Ref<Object>, Ref<Object>>> pairs;
  pairs.reserve(live_);
  forEach([&](const Object& k, const Object& v) {
    pairs.emplace_back(const_cast<Object*>(&k), const_cast<Object*>(&v));
  });
  return build(std::span(pairs));
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
  if (indexSize_ == 0) {
    for (size_t i = 0; i < used_; ++i) {
      const Entry& e = entries_[i];
      if (e.key && e.hash == hash && match(*e.key)) return i;
    }
    return SIZE_MAX;
  }
  size_t mask = indexSize_ - 1;
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
  if (indexSize_ == 0) {
    // A short list is searched by the text alone: hashing it would cost more.
    for (size_t i = 0; i < used_; ++i)
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
  for (const Entry& e : entries())
    if (e.key) out.push_back(e.key);
  return out;
}

bool Dictionary::isEqual(const Object& other) const noexcept {
  if (this == &other) return true;
  if (other.kind() != TypeKind::Dictionary) return false;
  const auto& o = static_cast<const Dictionary&>(other);
  if (live_ != o.live_) return false;
  for (const Entry& e : entries()) {
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

void MutableDictionary::sync() noexcept {
  entries_ = store_.data();
  used_ = static_cast<uint32_t>(store_.size());
  index_ = indexStore_.data();
  indexSize_ = static_cast<uint32_t>(indexStore_.size());
}

void MutableDictionary::rebuildIndex() {
  // Dropped first: should the new index fail to allocate, the entries are
  // still found by searching them in order.
  indexStore_.clear();
  sync();
  if (live_ <= kLinearLimit) return;
  std::vector<uint32_t> index(indexSizeFor(live_), 0);
  for (size_t i = 0; i < store_.size(); ++i)
    if (store_[i].key) placeInIndex(index.data(), index.size(), store_[i].hash, i);
  indexStore_ = std::move(index);
  sync();
}

void MutableDictionary::compact() {
  std::erase_if(store_, [](const Entry& e) { return !e.key; });
  rebuildIndex();
}

void MutableDictionary::set(Ref<Object> key, Ref<Object> value) {
  checkPair(key, value);
  size_t h = key->hash();
  size_t i = find(h, [&](const Object& k) { return k.isEqual(*key); });
  if (i != SIZE_MAX) {
    store_[i].value = std::move(value);
    return;
  }
  if (store_.size() >= kMaxEntries) throw std::length_error("dictionary too large");
  store_.push_back({std::move(key), std::move(value), h});
  ++live_;
  sync();
  if (indexStore_.empty()) {
    if (live_ > kLinearLimit) rebuildIndex();
    return;
  }
  // Keep the load (live entries and tombstones) under one half.
  if (store_.size() * 2 > indexStore_.size()) {
    if (store_.size() > live_ * 2)
      compact();
    else
      rebuildIndex();
    return;
  }
  placeInIndex(indexStore_.data(), indexStore_.size(), h, store_.size() - 1);
}

Ref<MutableDictionary> MutableDictionary::build(
    std::span<std::pair<Ref<Object>, Ref<Object>>> pairs) {
  auto d = qr::make<MutableDictionary>();
  d->reserve(pairs.size());
  for (auto& [key, value] : pairs) d->set(std::move(key), std::move(value));
  return d;
}

void MutableDictionary::set(std::string_view key, Ref<Object> value) {
  set(Ref<Object>(String::make(key)), std::move(value));
}

bool MutableDictionary::remove(const Object& key) {
  return removeAt(find(key.hash(), [&](const Object& k) { return k.isEqual(key); }));
}

bool MutableDictionary::remove(std::string_view key) { return removeAt(findText(key)); }

bool MutableDictionary::removeAt(size_t i) {
  if (i == SIZE_MAX) return false;
  if (!indexStore_.empty()) {
    size_t mask = indexStore_.size() - 1;
    size_t slot = store_[i].hash & mask;
    while (indexStore_[slot] != i + 1) slot = (slot + 1) & mask;
    indexStore_[slot] = kTombstone;
  }
  store_[i].key.reset();
  store_[i].value.reset();
  --live_;
  if (indexStore_.empty() || store_.size() > live_ * 2 + kLinearLimit) compact();
  return true;
}

void MutableDictionary::removeAll() noexcept {
  store_.clear();
  indexStore_.clear();
  live_ = 0;
  sync();
}

}  // namespace qr
