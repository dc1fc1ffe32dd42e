#include "plist/xml_value_builder.h"

#include <iterator>
#include <span>

#include "plist/xml_leaf_text.h"
#include "values/array.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace qr::xmlplist {

bool ValueBuilder::startRoot(Tag tag) {
  sawRoot_ = true;
  if (tag != Tag::Plist) return false;
  frames_.push_back({Tag::Plist, 0});
  return true;
}

bool ValueBuilder::endContainer() {
  if (leaf_ != Tag::Unknown || frames_.empty()) return false;
  Frame frame = frames_.back();
  frames_.pop_back();
  switch (frame.tag) {
    case Tag::Plist:
      if (values_.size() != 1) return false;
      root_ = std::move(values_.back());
      values_.clear();
      return true;
    case Tag::Array:
      values_.push_back(closeArray(frame.start));
      return true;
    case Tag::Dict:
      if ((values_.size() - frame.start) % 2 != 0) return false;  // a key without a value
      values_.push_back(closeDictionary(frame.start));
      return true;
    default:
      return false;
  }
}

Ref<Object> ValueBuilder::leafValue(std::string_view text) {
  switch (leaf_) {
    case Tag::Key:
      // Long keys (paths, URLs) name one entry each and are rarely repeated.
      if (text.size() <= kShortKey)
        if (auto shared = strings_.intern(text)) return shared;
      return qr::String::fromUTF8(text);
    case Tag::String:
      if (mutableLeaves_) {
        auto s = qr::make<MutableString>();
        s->appendUTF8(text);
        return s;
      }
      if (text.size() <= kShortString)
        if (auto shared = strings_.intern(text)) return shared;
      return qr::String::fromUTF8(text);
    case Tag::Integer:
      return parseInteger(text);
    case Tag::Real:
      return parseReal(text);
    case Tag::True:
    case Tag::False:
      if (!trimXMLSpace(text).empty()) return nullptr;
      return Boolean::of(leaf_ == Tag::True);
    case Tag::Data: {
      std::vector<uint8_t> bytes;
      if (!decodeBase64(text, bytes)) return nullptr;
      if (mutableLeaves_) return qr::make<MutableData>(std::move(bytes));
      return qr::make<qr::Data>(std::move(bytes));
    }
    case Tag::Date:
      return qr::Date::fromISO8601(trimXMLSpace(text));
    default:
      return nullptr;
  }
}

Ref<Object> ValueBuilder::closeArray(size_t start) {
  auto items = std::span(values_).subspan(start);
  Ref<Object> a = mutableContainers_ ? Ref<Object>(MutableArray::build(items))
                                     : Ref<Object>(qr::Array::build(items));
  values_.resize(start);
  return a;
}

Ref<Object> ValueBuilder::closeDictionary(size_t start) {
  pairs_.clear();
  for (size_t i = start; i < values_.size(); i += 2)
    pairs_.emplace_back(std::move(values_[i]), std::move(values_[i + 1]));
  values_.resize(start);
  if (mutableContainers_) return MutableDictionary::build(pairs_);
  return Dictionary::build(std::span(pairs_));
}

}  // namespace qr::xmlplist
