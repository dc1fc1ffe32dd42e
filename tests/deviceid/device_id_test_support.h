// Shorthands for the device ID tests: strings from UTF-8 literals and results
// as optional UTF-8, so that "no value" and "empty" stay apart in assertions.
#pragma once

#include <gtest/gtest.h>

#include <optional>
#include <string>
#include <string_view>

#include "values/array.h"
#include "values/string.h"

namespace deviceid_test {

inline qr::Ref<qr::String> S(std::string_view utf8) { return qr::String::make(utf8); }

template <class T>
std::optional<std::string> text(const qr::Ref<T>& value) {
  if (!value) return std::nullopt;
  return value->description();
}

inline qr::Ref<qr::Array> keys(std::initializer_list<std::string_view> names) {
  std::vector<qr::Ref<qr::Object>> items;
  for (auto n : names) items.push_back(qr::String::make(n));
  return qr::make<qr::Array>(std::move(items));
}

// The same text held in wide storage, to run the wide code paths on ASCII.
inline qr::Ref<qr::String> wideASCII(std::string_view ascii) {
  auto m = qr::make<qr::MutableString>();
  m->append(std::u16string_view(u"\u00e9"));
  m->replace(0, 1, *qr::String::make(ascii));
  return m;
}

// One row of a table: an input and what an operation should give for it.
struct Case {
  std::string_view input;
  std::optional<std::string> expected;
};

// Applies the operation to each input (made into a value by `input`), naming
// the operation and the input on failure.
template <class Op, class Input = decltype(&S)>
void expectCases(std::string_view name, Op op, std::initializer_list<Case> cases,
                 Input input = &S) {
  for (const Case& c : cases)
    EXPECT_EQ(text(op(*input(c.input))), c.expected) << name << " of \"" << c.input << "\"";
}

}  // namespace deviceid_test
