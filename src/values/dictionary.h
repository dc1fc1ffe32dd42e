// Key-value collections keyed by any object with value equality and hashing,
// enumerating in insertion order. Small dictionaries are searched linearly;
// larger ones keep an open-addressing index beside the entry list.
#pragma once

#include <span>
#include <string_view>
#include <utility>
#include <vector>

#include "values/object.h"

namespace qr {

class String;
class MutableDictionary;

class Dictionary : public Object {
 public:
  struct Entry {
    Ref<Object> key;  // null marks a removed entry
    Ref<Object> value;
    size_t hash = 0;
  };

  Dictionary() = default;
  Dictionary(const Dictionary&) = delete;
  ~Dictionary() override;

  // An immutable dictionary of the pairs in order; a repeated key keeps its
  // first position and its last value. Its entries share one allocation with it.
  static Ref<Dictionary> build(std::vector<std::pair<Ref<Object>, Ref<Object>>> pairs);
  // The same, moving the pairs out of a buffer the caller keeps using.
  static Ref<Dictionary> build(std::span<std::pair<Ref<Object>, Ref<Object>>> pairs);
  // Shallow copies: keys and values are shared.
  Ref<Dictionary> copy() const;
  Ref<MutableDictionary> mutableCopy() const;

  size_t count() const noexcept { return live_; }
  bool isEmpty() const noexcept { return live_ == 0; }
  Object* get(const Object& key) const noexcept;
  Object* get(const Ref<Object>& key) const noexcept { return key ? get(*key) : nullptr; }
  // Lookup by an ASCII or UTF-8 string key without building a key object.
  Object* get(std::string_view key) const noexcept;
  template <class T>
  T* getAs(std::string_view key) const noexcept {
    return cast<T>(get(key));
  }
  bool contains(const Object& key) const noexcept { return get(key) != nullptr; }

  // Calls f(key, value) for every entry in insertion order.
  template <class F>
  void forEach(F&& f) const {
    for (const Entry& e : entries())
      if (e.key) f(*e.key, *e.value);
  }
  std::vector<Ref<Object>> keys() const;

  TypeKind kind() const noexcept override { return TypeKind::Dictionary; }
  bool isEqual(const Object& other) const noexcept override;
  size_t hash() const noexcept override { return live_; }
  std::string description() const override;

 protected:
  std::span<const Entry> entries() const noexcept { return {entries_, used_}; }
  template <class Match>
  size_t find(size_t hash, Match&& match) const noexcept;
  // The position of the entry whose key is a string of this text, or SIZE_MAX.
  size_t findText(std::string_view key) const noexcept;

  // What the lookups read: the block after an immutable dictionary, or the
  // storage of a mutable one, which points here again after every change.
  Entry* entries_ = nullptr;
  uint32_t used_ = 0;  // entries in use, removed ones included
  uint32_t live_ = 0;
  uint32_t* index_ = nullptr;  // entry position + 1; 0 empty; kTombstone removed
  uint32_t indexSize_ = 0;     // a power of two, or 0 for a short list searched in order

 private:
  // Unsized: an immutable one is larger than its class.
  void dispose() const noexcept override { destroyInBlock(); }
  bool ownsBlock_ = false;  // its entries follow it in its own block
};

class MutableDictionary final : public Dictionary {
 public:
  MutableDictionary() = default;
  // Moves the pairs out of a buffer the caller keeps using; a repeated key
  // keeps its first position and its last value, as set() does.
  static Ref<MutableDictionary> build(std::span<std::pair<Ref<Object>, Ref<Object>>> pairs);
  // Replaces the value of an equal key in place, keeping its position.
  void set(Ref<Object> key, Ref<Object> value);
  void set(std::string_view key, Ref<Object> value);
  bool remove(const Object& key);
  bool remove(std::string_view key);
  void removeAll() noexcept;
  void reserve(size_t n) {
    store_.reserve(n);
    sync();
  }

 private:
  bool removeAt(size_t position);
  void rebuildIndex();
  void compact();
  void sync() noexcept;

  std::vector<Entry> store_;
  std::vector<uint32_t> indexStore_;
};

template <>
inline constexpr TypeKind kExactKind<Dictionary> = TypeKind::Dictionary;

}  // namespace qr
