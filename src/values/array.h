// Ordered collections of objects, immutable and mutable.
#pragma once

#include <span>
#include <vector>

#include "values/object.h"

namespace qr {

class MutableArray;

class Array : public Object {
 public:
  Array() = default;
  ~Array() override;

  // An immutable array of the items, which share one allocation with it.
  static Ref<Array> build(std::vector<Ref<Object>> items);
  // The same, moving the items out of a buffer the caller keeps using.
  static Ref<Array> build(std::span<Ref<Object>> items);
  // Shallow copies: the elements are shared.
  Ref<Array> copy() const;
  Ref<MutableArray> mutableCopy() const;

  size_t count() const noexcept { return count_; }
  bool isEmpty() const noexcept { return count_ == 0; }
  // The element, or null past the end.
  Object* at(size_t i) const noexcept { return i < count_ ? items_[i].get() : nullptr; }
  std::span<const Ref<Object>> items() const noexcept { return {items_, count_}; }
  const Ref<Object>* begin() const noexcept { return items_; }
  const Ref<Object>* end() const noexcept { return items_ + count_; }

  TypeKind kind() const noexcept override { return TypeKind::Array; }
  bool isEqual(const Object& other) const noexcept override;
  size_t hash() const noexcept override { return count_; }
  std::string description() const override;

 protected:
  // The block after an immutable array, or a mutable one's storage, which
  // points here again after every change.
  Ref<Object>* items_ = nullptr;
  size_t count_ = 0;

 private:
  // Unsized: an immutable one is larger than its class.
  void dispose() const noexcept override { destroyInBlock(); }
  bool ownsBlock_ = false;  // its entries follow it in its own block
};

class MutableArray final : public Array {
 public:
  MutableArray() = default;
  explicit MutableArray(std::vector<Ref<Object>> items) : store_(std::move(items)) { sync(); }
  // Moves the items out of a buffer the caller keeps using.
  static Ref<MutableArray> build(std::span<Ref<Object>> items);

  void append(Ref<Object> value) {
    store_.push_back(std::move(value));
    sync();
  }
  void insert(size_t index, Ref<Object> value);
  void set(size_t index, Ref<Object> value);
  void removeAt(size_t index);
  void removeAll() noexcept {
    store_.clear();
    sync();
  }
  void reserve(size_t n) {
    store_.reserve(n);
    sync();
  }

 private:
  void sync() noexcept {
    items_ = store_.data();
    count_ = store_.size();
  }

  std::vector<Ref<Object>> store_;
};

template <>
inline constexpr TypeKind kExactKind<Array> = TypeKind::Array;

}  // namespace qr
