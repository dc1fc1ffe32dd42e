// The reference-counted base of every object in the system and its smart pointer.
#pragma once

#include <atomic>
#include <cstddef>
#include <cstdint>
#include <string>
#include <type_traits>
#include <utility>

namespace qr {

// Lets generic code (the property-list writer, deep copy, the C interface) tell
// values apart without a chain of dynamic_casts.
enum class TypeKind : uint8_t {
  Other,
  String,
  Number,
  Boolean,
  Data,
  Date,
  Array,
  Dictionary,
  URL,
  UUID,
};

class Object {
 public:
  Object() = default;
  Object(const Object&) = delete;
  Object& operator=(const Object&) = delete;
  virtual ~Object() = default;

  void retain() const noexcept {
    if (!isImmortal()) refs_.fetch_add(1, std::memory_order_relaxed);
  }
  void release() const noexcept {
    if (!isImmortal() && refs_.fetch_sub(1, std::memory_order_acq_rel) == 1) dispose();
  }
  // For values shared by the whole process: from now on retains and releases
  // do not count, so a plug-in that releases one too often cannot free it.
  // Call it before the object is shared.
  void makeImmortal() const noexcept { refs_.store(kImmortal, std::memory_order_relaxed); }
  uint32_t retainCount() const noexcept { return refs_.load(std::memory_order_relaxed); }

  virtual TypeKind kind() const noexcept { return TypeKind::Other; }
  // Value equality for values; identity for everything else.
  virtual bool isEqual(const Object& other) const noexcept { return this == &other; }
  virtual size_t hash() const noexcept { return reinterpret_cast<uintptr_t>(this) >> 4; }
  // The text an object prints as in a log line's "%@" slot.
  virtual std::string description() const;

 protected:
  // Frees the object once the last reference is gone; objects allocated with
  // trailing storage override it to free that storage the way it was taken.
  virtual void dispose() const noexcept { delete this; }
  // dispose() for objects placed at the start of a block taken with
  // ::operator new, their trailing storage after them.
  void destroyInBlock() const noexcept;

 private:
  static constexpr uint32_t kImmortal = UINT32_MAX;
  bool isImmortal() const noexcept { return refs_.load(std::memory_order_relaxed) == kImmortal; }

  mutable std::atomic<uint32_t> refs_{1};
};

// Intrusive counted pointer. A raw pointer given to the constructor is retained;
// adopt() takes over the reference a new object is born with.
template <class T>
class Ref {
 public:
  Ref() noexcept = default;
  Ref(std::nullptr_t) noexcept {}
  Ref(T* p) noexcept : p_(p) {
    if (p_) p_->retain();
  }
  Ref(const Ref& other) noexcept : Ref(other.p_) {}
  Ref(Ref&& other) noexcept : p_(std::exchange(other.p_, nullptr)) {}
  template <class U, class = std::enable_if_t<std::is_convertible_v<U*, T*>>>
  Ref(const Ref<U>& other) noexcept : Ref(other.get()) {}
  template <class U, class = std::enable_if_t<std::is_convertible_v<U*, T*>>>
  Ref(Ref<U>&& other) noexcept : p_(other.leak()) {}
  ~Ref() {
    if (p_) p_->release();
  }

  Ref& operator=(Ref other) noexcept {
    std::swap(p_, other.p_);
    return *this;
  }

  static Ref adopt(T* p) noexcept {
    Ref r;
    r.p_ = p;
    return r;
  }

  T* get() const noexcept { return p_; }
  T* operator->() const noexcept { return p_; }
  T& operator*() const noexcept { return *p_; }
  explicit operator bool() const noexcept { return p_ != nullptr; }
  // Hands the reference to the caller, who must release it.
  [[nodiscard]] T* leak() noexcept { return std::exchange(p_, nullptr); }
  void reset() noexcept { Ref().swap(*this); }
  void swap(Ref& other) noexcept { std::swap(p_, other.p_); }

 private:
  T* p_ = nullptr;
};

template <class T, class U>
bool operator==(const Ref<T>& a, const Ref<U>& b) noexcept {
  return static_cast<const void*>(a.get()) == static_cast<const void*>(b.get());
}
template <class T>
bool operator==(const Ref<T>& a, std::nullptr_t) noexcept {
  return a.get() == nullptr;
}

template <class T, class... Args>
Ref<T> make(Args&&... args) {
  return Ref<T>::adopt(new T(std::forward<Args>(args)...));
}

// The kind that a value class alone reports, set beside each such class, so
// that a test for it is one virtual call rather than a dynamic_cast. Other
// for the rest (the mutable subclasses among them).
template <class T>
inline constexpr TypeKind kExactKind = TypeKind::Other;

// Kind-of-class test: the object as T, or null.
template <class T>
T* cast(const Object* o) noexcept {
  if constexpr (kExactKind<T> != TypeKind::Other)
    return o && o->kind() == kExactKind<T> ? static_cast<T*>(const_cast<Object*>(o)) : nullptr;
  else
    return dynamic_cast<T*>(const_cast<Object*>(o));
}
template <class T, class U>
Ref<T> cast(const Ref<U>& r) noexcept {
  return Ref<T>(cast<T>(r.get()));
}

// Value equality where either side may be null (two nulls are equal).
inline bool equal(const Object* a, const Object* b) noexcept {
  if (a == b) return true;
  if (!a || !b) return false;
  return a->isEqual(*b);
}
template <class T, class U>
bool equal(const Ref<T>& a, const Ref<U>& b) noexcept {
  return equal(a.get(), b.get());
}

template <class T>
T* immortal(T* object) noexcept {
  object->makeImmortal();
  return object;
}

// Object description with nil printed as "(null)".
std::string describe(const Object* o);

}  // namespace qr
