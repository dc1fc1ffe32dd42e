// Byte strings, immutable and mutable.
#pragma once

#include <cstdint>
#include <span>
#include <string_view>
#include <vector>

#include "values/object.h"

namespace qr {

class Data : public Object {
 public:
  explicit Data(std::vector<uint8_t> bytes) : bytes_(std::move(bytes)) {}
  static Ref<Data> copy(std::span<const uint8_t> bytes) {
    return qr::make<Data>(std::vector<uint8_t>(bytes.begin(), bytes.end()));
  }
  static Ref<Data> copy(std::string_view bytes) {
    return qr::make<Data>(std::vector<uint8_t>(bytes.begin(), bytes.end()));
  }

  const uint8_t* bytes() const noexcept { return bytes_.data(); }
  size_t length() const noexcept { return bytes_.size(); }
  std::span<const uint8_t> span() const noexcept { return bytes_; }
  std::string_view view() const noexcept {
    return {reinterpret_cast<const char*>(bytes_.data()), bytes_.size()};
  }

  TypeKind kind() const noexcept override { return TypeKind::Data; }
  bool isEqual(const Object& other) const noexcept override;
  size_t hash() const noexcept override;
  std::string description() const override;

 protected:
  std::vector<uint8_t> bytes_;
};

class MutableData final : public Data {
 public:
  MutableData() : Data({}) {}
  explicit MutableData(std::vector<uint8_t> bytes) : Data(std::move(bytes)) {}
  std::vector<uint8_t>& storage() noexcept { return bytes_; }
};

template <>
inline constexpr TypeKind kExactKind<Data> = TypeKind::Data;

}  // namespace qr
