// Ordered collections of objects, immutable and mutable.
#pragma once

#include <vector>

#include "values/object.h"

namespace qr {

class MutableArray;

class Array : public Object {
 public:
  Array() = default;
  explicit Array(std::vector<Ref<Object>> items) : items_(std::move(items)) {}

  // Shallow copies: the elements are shared.
  Ref<Array> copy() const;
  Ref<MutableArray> mutableCopy() const;

  size_t count() const noexcept { return items_.size(); }
  bool isEmpty() const noexcept { return items_.empty(); }
  // The element, or null past the end.
  Object* at(size_t i) const noexcept { return i < items_.size() ? items_[i].get() : nullptr; }
  const std::vector<Ref<Object>>& items() const noexcept { return items_; }
  auto begin() const noexcept { return items_.begin(); }
  auto end() const noexcept { return items_.end(); }

  TypeKind kind() const noexcept override { return TypeKind::Array; }
  bool isEqual(const Object& other) const noexcept override;
  size_t hash() const noexcept override { return items_.size(); }
  std::string description() const override;

 protected:
  std::vector<Ref<Object>> items_;
};

class MutableArray final : public Array {
 public:
  MutableArray() = default;
  explicit MutableArray(std::vector<Ref<Object>> items) : Array(std::move(items)) {}

  void append(Ref<Object> value) { items_.push_back(std::move(value)); }
  void insert(size_t index, Ref<Object> value);
  void set(size_t index, Ref<Object> value);
  void removeAt(size_t index);
  void removeAll() noexcept { items_.clear(); }
  void reserve(size_t n) { items_.reserve(n); }
};

template <>
inline constexpr TypeKind kExactKind<Array> = TypeKind::Array;

}  // namespace qr
