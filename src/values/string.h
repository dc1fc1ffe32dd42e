// Immutable and mutable text values. Positions and lengths count UTF-16 code
// units; text that is all ASCII is kept one byte per unit, which no caller can
// observe except through the narrow() fast path.
#pragma once

#include <atomic>
#include <string>
#include <string_view>

#include "values/object.h"

namespace qr {

class MutableString;

class String : public Object {
 public:
  // Null when the bytes are not well-formed UTF-8.
  static Ref<String> fromUTF8(std::string_view utf8);
  // Any code units, lone surrogates included.
  static Ref<String> fromUTF16(std::u16string_view units);
  // For text known to be valid UTF-8 (literals, our own output): never null;
  // ill-formed sequences become U+FFFD.
  static Ref<String> make(std::string_view utf8);
  static Ref<String> empty();

  size_t length() const noexcept { return length_; }
  bool isEmpty() const noexcept { return length_ == 0; }
  char16_t at(size_t i) const noexcept {
    return wide_ ? static_cast<const char16_t*>(data_)[i]
                 : static_cast<char16_t>(static_cast<const unsigned char*>(data_)[i]);
  }
  // Narrow text is ASCII, so narrow() is also its UTF-8 form.
  bool isNarrow() const noexcept { return !wide_; }
  std::string_view narrow() const noexcept {
    return wide_ ? std::string_view() : std::string_view(static_cast<const char*>(data_), length_);
  }
  std::u16string_view wide() const noexcept {
    return wide_ ? std::u16string_view(static_cast<const char16_t*>(data_), length_)
                 : std::u16string_view();
  }

  std::u16string utf16() const;
  // Lone surrogates come out as U+FFFD.
  std::string utf8() const;
  // The units [start, start + count), clamped to the string.
  Ref<String> substring(size_t start, size_t count) const;
  // Orders by UTF-16 code units: -1, 0 or 1.
  int compare(const String& other) const noexcept;
  bool equals(std::string_view ascii) const noexcept;
  bool hasPrefix(const String& prefix) const noexcept;
  bool hasPrefix(std::string_view ascii) const noexcept;
  Ref<MutableString> mutableCopy() const;
  // An immutable copy; an immutable string returns itself.
  virtual Ref<String> copy() const;

  TypeKind kind() const noexcept override { return TypeKind::String; }
  bool isEqual(const Object& other) const noexcept override;
  size_t hash() const noexcept override;
  std::string description() const override { return utf8(); }

 protected:
  String() = default;
  void setStorage(const void* data, size_t length, bool wide) noexcept {
    data_ = data;
    length_ = static_cast<uint32_t>(length);
    wide_ = wide;
    hash_.store(0, std::memory_order_relaxed);
  }

 private:
  uint32_t length_ = 0;
  bool wide_ = false;
  const void* data_ = "";
  // Computed on first use: a key shared by many dictionaries (as readers
  // share them) is hashed once. 0 means not yet.
  mutable std::atomic<size_t> hash_{0};
};

class MutableString final : public String {
 public:
  MutableString() = default;
  explicit MutableString(const String& initial) { append(initial); }

  void append(const String& text);
  void append(std::u16string_view units);
  // ASCII or UTF-8 text.
  void appendUTF8(std::string_view utf8);
  void replace(size_t start, size_t count, const String& with);
  void setString(const String& text);

  Ref<String> copy() const override;

 private:
  void widen();
  void sync() noexcept;

  std::string narrow_;
  std::u16string wide_;
  bool isWide_ = false;
};

// Hash of a run of code units, the same whether they are stored narrow or wide.
size_t hashCodeUnits(std::string_view narrow) noexcept;
size_t hashCodeUnits(std::u16string_view wide) noexcept;

// UTF-8 <-> UTF-16 without ICU: these sit on every parser's hot path.
bool decodeUTF8(std::string_view utf8, std::u16string& out);
void encodeUTF8(std::u16string_view units, std::string& out);
bool isASCII(std::string_view bytes) noexcept;

template <>
inline constexpr TypeKind kExactKind<String> = TypeKind::String;

}  // namespace qr
