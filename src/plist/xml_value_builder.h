// Builds the value of an XML property list from its elements as they open
// and close, on an explicit stack, so nesting costs no C++ recursion. Both
// XML readers build through it: they cannot differ in a value, nor in which
// arrangements of elements they refuse.
#pragma once

#include <cstdint>
#include <string_view>
#include <utility>
#include <vector>

#include "plist/xml_string_table.h"
#include "values/deep_copy.h"
#include "values/object.h"

namespace qr::xmlplist {

enum class Tag : uint8_t {
  Unknown,
  Plist,
  Dict,
  Array,
  Key,
  String,
  Integer,
  Real,
  True,
  False,
  Data,
  Date,
};

// Unknown for any name outside the property-list vocabulary.
inline Tag tagOf(std::string_view name) noexcept {
  if (name.empty()) return Tag::Unknown;
  auto is = [name](std::string_view word) { return name == word; };
  switch (name[0]) {
    case 'k':
      return is("key") ? Tag::Key : Tag::Unknown;
    case 's':
      return is("string") ? Tag::String : Tag::Unknown;
    case 'd':
      if (is("dict")) return Tag::Dict;
      if (is("data")) return Tag::Data;
      return is("date") ? Tag::Date : Tag::Unknown;
    case 'a':
      return is("array") ? Tag::Array : Tag::Unknown;
    case 'i':
      return is("integer") ? Tag::Integer : Tag::Unknown;
    case 'r':
      return is("real") ? Tag::Real : Tag::Unknown;
    case 't':
      return is("true") ? Tag::True : Tag::Unknown;
    case 'f':
      return is("false") ? Tag::False : Tag::Unknown;
    case 'p':
      return is("plist") ? Tag::Plist : Tag::Unknown;
    default:
      return Tag::Unknown;
  }
}

// The element name of a known tag.
inline std::string_view nameOf(Tag tag) noexcept {
  static constexpr std::string_view kNames[] = {"",     "plist",  "dict",    "array",
                                                "key",  "string", "integer", "real",
                                                "true", "false",  "data",    "date"};
  return kNames[static_cast<size_t>(tag)];
}
constexpr bool isContainer(Tag tag) noexcept {
  return tag == Tag::Plist || tag == Tag::Dict || tag == Tag::Array;
}

class ValueBuilder {
 public:
  explicit ValueBuilder(Mutability mutability)
      : mutableContainers_(mutability != Mutability::Immutable),
        mutableLeaves_(mutability == Mutability::MutableContainersAndLeaves) {}

  // Each returns false where the document stops being a property list; the
  // builder is then of no further use.
  bool start(Tag tag) {
    if (!sawRoot_) return startRoot(tag);
    if (tag == Tag::Unknown || tag == Tag::Plist || !mayStartValue(tag == Tag::Key)) return false;
    // The <plist> frame holds no value of its own, so frames_.size() is the
    // depth the new value sits at, the top level being depth one.
    if (frames_.size() > kMaxPropertyListDepth) return false;
    if (isContainer(tag))
      frames_.push_back({tag, values_.size()});
    else
      leaf_ = tag;
    return true;
  }
  // Closes the open leaf element with the text it held.
  bool endLeaf(std::string_view text) {
    if (leaf_ == Tag::Unknown) return false;
    Ref<Object> value = leafValue(text);
    leaf_ = Tag::Unknown;
    if (!value) return false;
    values_.push_back(std::move(value));
    return true;
  }
  // Closes the innermost open <plist>, <array> or <dict>.
  bool endContainer();

  // The open leaf element; Unknown between elements.
  Tag openLeaf() const noexcept { return leaf_; }
  // The innermost open container; Unknown before <plist> and once it closed.
  Tag openContainer() const noexcept { return frames_.empty() ? Tag::Unknown : frames_.back().tag; }
  // The value once </plist> has closed; null before.
  Ref<Object> finish() { return frames_.empty() ? std::move(root_) : nullptr; }

 private:
  // An open <plist>, <array> or <dict>; its children sit in values_ from
  // `start` on (for a dictionary, key and value alternate).
  struct Frame {
    Tag tag;
    size_t start;
  };

  bool startRoot(Tag tag);
  bool mayStartValue(bool isKey) const noexcept {
    if (leaf_ != Tag::Unknown || frames_.empty()) return false;
    const Frame& top = frames_.back();
    size_t children = values_.size() - top.start;
    switch (top.tag) {
      case Tag::Plist:
        return !isKey && children == 0;
      case Tag::Array:
        return !isKey;
      case Tag::Dict:
        return isKey == (children % 2 == 0);
      default:
        return false;
    }
  }
  Ref<Object> leafValue(std::string_view text);
  Ref<Object> closeArray(size_t start);
  Ref<Object> closeDictionary(size_t start);

  const bool mutableContainers_;
  const bool mutableLeaves_;
  bool sawRoot_ = false;
  Tag leaf_ = Tag::Unknown;
  std::vector<Frame> frames_;
  std::vector<Ref<Object>> values_;
  // Where a closing dictionary's pairs are gathered, kept for the next one.
  std::vector<std::pair<Ref<Object>, Ref<Object>>> pairs_;
  Ref<Object> root_;
  // Keys and immutable string values up to these lengths are shared within
  // the parse.
  static constexpr size_t kShortString = 32;
  static constexpr size_t kShortKey = 48;
  static constexpr size_t kMaxShared = size_t(1) << 18;
  StringTable strings_{kMaxShared};
};

}  // namespace qr::xmlplist
