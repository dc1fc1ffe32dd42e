// printf-like formatting of log messages with "%@" for objects: an object
// prints as its description, a null one as "(null)". Also %d, %u, %x, %08x,
// %s and %%.
#pragma once

#include <cstdint>
#include <string>
#include <string_view>
#include <type_traits>
#include <vector>

#include "values/object.h"

namespace qr {

struct FormatArg {
  enum class Type { Object, Signed, Unsigned, Text } type;
  const Object* object = nullptr;
  int64_t i = 0;
  uint64_t u = 0;
  std::string_view text;

  FormatArg(const Object* o) : type(Type::Object), object(o) {}
  template <class T>
  FormatArg(const Ref<T>& r) : type(Type::Object), object(r.get()) {}
  FormatArg(const std::string& s) : type(Type::Text), text(s) {}
  FormatArg(std::string_view s) : type(Type::Text), text(s) {}
  FormatArg(const char* s) : type(Type::Text), text(s ? s : "(null)") {}
  template <class T, class = std::enable_if_t<std::is_integral_v<T>>>
  FormatArg(T v) {
    if constexpr (std::is_signed_v<T>) {
      type = Type::Signed;
      i = v;
    } else {
      type = Type::Unsigned;
      u = v;
    }
  }
};

std::string formatArgs(std::string_view format, const std::vector<FormatArg>& args);

template <class... Args>
std::string format(std::string_view fmt, const Args&... args) {
  return formatArgs(fmt, std::vector<FormatArg>{FormatArg(args)...});
}

}  // namespace qr
