// The XML property-list reader: libexpat tokenizes, and the handlers below
// build the values on an explicit stack, so nesting costs no C++ recursion.
// Anything outside the property-list vocabulary stops the parse with null.
#include <expat.h>

#include <algorithm>
#include <cstring>
#include <iterator>
#include <vector>

#include "plist/property_list.h"
#include "plist/xml_leaf_text.h"
#include "plist/xml_string_table.h"
#include "values/array.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace qr {
namespace {

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

Tag tagOf(const XML_Char* name) noexcept {
  auto is = [name](const char* word) { return std::strcmp(name + 1, word + 1) == 0; };
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

bool isXMLSpace(const XML_Char* s, int len) noexcept {
  // Indentation reaches this handler one run at a time, millions of times
  // in a large file: one shift and mask per character.
  constexpr uint64_t kSpaces = 1ull << ' ' | 1ull << '\t' | 1ull << '\n' | 1ull << '\r';
  for (int i = 0; i < len; ++i) {
    auto c = static_cast<unsigned char>(s[i]);
    if (c > ' ' || !(kSpaces >> c & 1)) return false;
  }
  return true;
}

class Reader {
 public:
  explicit Reader(Mutability mutability)
      : mutableContainers_(mutability != Mutability::Immutable),
        mutableLeaves_(mutability == Mutability::MutableContainersAndLeaves) {}

  Ref<Object> parse(std::string_view bytes);

 private:
  // An open <plist>, <array> or <dict>; its children sit in values_ from
  // `start` on (for a dictionary, key and value alternate).
  struct Frame {
    Tag tag;
    size_t start;
  };

  static void XMLCALL onStart(void* self, const XML_Char* name, const XML_Char** attributes);
  static void XMLCALL onEnd(void* self, const XML_Char* name);
  static void XMLCALL onText(void* self, const XML_Char* text, int length);
  static void XMLCALL onDoctype(void* self, const XML_Char* name, const XML_Char* systemId,
                                const XML_Char* publicId, int hasInternalSubset);
  static void XMLCALL onEntityDecl(void* self, const XML_Char*, int, const XML_Char*, int,
                                   const XML_Char*, const XML_Char*, const XML_Char*,
                                   const XML_Char*);
  static void XMLCALL onSkippedEntity(void* self, const XML_Char*, int);

  void start(Tag tag);
  void end();
  bool mayStartValue(bool isKey) const noexcept;
  Ref<Object> leafValue();
  Ref<Object> closeArray(size_t start);
  Ref<Object> closeDictionary(size_t start);
  void fail() noexcept {
    if (!failed_) XML_StopParser(parser_, XML_FALSE);
    failed_ = true;
  }

  XML_Parser parser_ = nullptr;
  const bool mutableContainers_;
  const bool mutableLeaves_;
  bool failed_ = false;
  bool sawRoot_ = false;
  Tag leaf_ = Tag::Unknown;  // the open leaf element, if any
  size_t events_ = 0;
  std::vector<Frame> frames_;
  std::vector<Ref<Object>> values_;
  std::string text_;
  Ref<Object> root_;
  // Every key, and short immutable string values, are shared within the parse.
  static constexpr size_t kShortString = 32;
  static constexpr size_t kMaxShared = size_t(1) << 18;
  xmlplist::StringTable strings_{kMaxShared};
};

void XMLCALL Reader::onStart(void* self, const XML_Char* name, const XML_Char**) {
  auto* r = static_cast<Reader*>(self);
  ++r->events_;
  if (r->failed_) return;
  try {
    r->start(tagOf(name));
  } catch (...) {  // no exception may unwind through expat
    r->fail();
  }
}

void XMLCALL Reader::onEnd(void* self, const XML_Char*) {
  // expat has already matched the end tag to its start tag.
  auto* r = static_cast<Reader*>(self);
  ++r->events_;
  if (r->failed_) return;
  try {
    r->end();
  } catch (...) {
    r->fail();
  }
}

void XMLCALL Reader::onText(void* self, const XML_Char* text, int length) {
  auto* r = static_cast<Reader*>(self);
  ++r->events_;
  if (r->failed_) return;
  if (r->leaf_ == Tag::Unknown) {
    if (!isXMLSpace(text, length)) r->fail();  // text between the elements of a container
    return;
  }
  try {
    r->text_.append(text, static_cast<size_t>(length));
  } catch (...) {
    r->fail();
  }
}

void XMLCALL Reader::onDoctype(void* self, const XML_Char*, const XML_Char*, const XML_Char*,
                               int hasInternalSubset) {
  // An internal subset could declare entities or default attributes; a
  // property list never needs one.
  if (hasInternalSubset) static_cast<Reader*>(self)->fail();
}

void XMLCALL Reader::onEntityDecl(void* self, const XML_Char*, int, const XML_Char*, int,
                                  const XML_Char*, const XML_Char*, const XML_Char*,
                                  const XML_Char*) {
  static_cast<Reader*>(self)->fail();
}

void XMLCALL Reader::onSkippedEntity(void* self, const XML_Char*, int) {
  // A reference to an entity that only an unread external DTD could define:
  // dropping it silently would change the text.
  static_cast<Reader*>(self)->fail();
}

bool Reader::mayStartValue(bool isKey) const noexcept {
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

void Reader::start(Tag tag) {
  if (!sawRoot_) {
    sawRoot_ = true;
    if (tag != Tag::Plist) return fail();
    frames_.push_back({Tag::Plist, 0});
    return;
  }
  if (tag == Tag::Unknown || tag == Tag::Plist || !mayStartValue(tag == Tag::Key)) return fail();
  // The <plist> frame holds no value of its own, so frames_.size() is the
  // depth the new value sits at, the top level being depth one.
  if (frames_.size() > kMaxPropertyListDepth) return fail();
  if (tag == Tag::Array || tag == Tag::Dict) {
    frames_.push_back({tag, values_.size()});
    return;
  }
  leaf_ = tag;
  text_.clear();
}

void Reader::end() {
  if (leaf_ != Tag::Unknown) {
    Ref<Object> value = leafValue();
    leaf_ = Tag::Unknown;
    if (!value) return fail();
    values_.push_back(std::move(value));
    return;
  }
  Frame frame = frames_.back();
  frames_.pop_back();
  switch (frame.tag) {
    case Tag::Plist:
      if (values_.size() != 1) return fail();
      root_ = std::move(values_.back());
      values_.clear();
      return;
    case Tag::Array:
      values_.push_back(closeArray(frame.start));
      return;
    case Tag::Dict:
      if ((values_.size() - frame.start) % 2 != 0) return fail();  // a key without a value
      values_.push_back(closeDictionary(frame.start));
      return;
    default:
      return fail();
  }
}

Ref<Object> Reader::leafValue() {
  switch (leaf_) {
    case Tag::Key:
      if (auto shared = strings_.intern(text_)) return shared;
      return String::fromUTF8(text_);
    case Tag::String:
      if (mutableLeaves_) {
        auto s = qr::make<MutableString>();
        s->appendUTF8(text_);
        return s;
      }
      if (text_.size() <= kShortString)
        if (auto shared = strings_.intern(text_)) return shared;
      return String::fromUTF8(text_);
    case Tag::Integer:
      return xmlplist::parseInteger(text_);
    case Tag::Real:
      return xmlplist::parseReal(text_);
    case Tag::True:
    case Tag::False:
      if (!xmlplist::trimXMLSpace(text_).empty()) return nullptr;
      return Boolean::of(leaf_ == Tag::True);
    case Tag::Data: {
      std::vector<uint8_t> bytes;
      if (!xmlplist::decodeBase64(text_, bytes)) return nullptr;
      if (mutableLeaves_) return qr::make<MutableData>(std::move(bytes));
      return qr::make<qr::Data>(std::move(bytes));
    }
    case Tag::Date:
      return Date::fromISO8601(xmlplist::trimXMLSpace(text_));
    default:
      return nullptr;
  }
}

Ref<Object> Reader::closeArray(size_t start) {
  std::vector<Ref<Object>> items(std::make_move_iterator(values_.begin() + ptrdiff_t(start)),
                                 std::make_move_iterator(values_.end()));
  values_.resize(start);
  if (mutableContainers_) return qr::make<MutableArray>(std::move(items));
  return qr::make<qr::Array>(std::move(items));
}

Ref<Object> Reader::closeDictionary(size_t start) {
  size_t n = (values_.size() - start) / 2;
  if (mutableContainers_) {
    auto d = qr::make<MutableDictionary>();
    d->reserve(n);
    for (size_t i = start; i < values_.size(); i += 2)
      d->set(std::move(values_[i]), std::move(values_[i + 1]));
    values_.resize(start);
    return d;
  }
  std::vector<std::pair<Ref<Object>, Ref<Object>>> pairs;
  pairs.reserve(n);
  for (size_t i = start; i < values_.size(); i += 2)
    pairs.emplace_back(std::move(values_[i]), std::move(values_[i + 1]));
  values_.resize(start);
  return Dictionary::build(std::move(pairs));
}

Ref<Object> Reader::parse(std::string_view bytes) {
  parser_ = XML_ParserCreate(nullptr);
  if (!parser_) return nullptr;
  XML_SetUserData(parser_, this);
  XML_SetElementHandler(parser_, onStart, onEnd);
  XML_SetCharacterDataHandler(parser_, onText);
  XML_SetStartDoctypeDeclHandler(parser_, onDoctype);
  XML_SetEntityDeclHandler(parser_, onEntityDecl);
  XML_SetSkippedEntityHandler(parser_, onSkippedEntity);
  XML_SetParamEntityParsing(parser_, XML_PARAM_ENTITY_PARSING_NEVER);

  // expat copies what it is given into its own buffer, so feeding it in
  // pieces keeps that copy small. A piece that produced no event is most
  // likely inside one long token, which expat rescans from its start with
  // every piece: doubling the next piece keeps that rescanning linear.
  constexpr size_t kPiece = 256 * 1024;
  size_t piece = kPiece;
  size_t offset = 0;
  do {
    size_t n = std::min(piece, bytes.size() - offset);
    if (n > size_t(INT32_MAX)) n = size_t(INT32_MAX);
    bool last = offset + n == bytes.size();
    void* buffer = XML_GetBuffer(parser_, static_cast<int>(n));
    if (!buffer) {
      failed_ = true;
      break;
    }
    if (n) std::memcpy(buffer, bytes.data() + offset, n);
    size_t eventsBefore = events_;
    if (XML_ParseBuffer(parser_, static_cast<int>(n), last) != XML_STATUS_OK || failed_) {
      failed_ = true;
      break;
    }
    offset += n;
    piece = events_ == eventsBefore ? std::min(piece * 2, size_t(INT32_MAX)) : kPiece;
  } while (offset < bytes.size());
  XML_ParserFree(parser_);
  parser_ = nullptr;
  if (failed_ || !frames_.empty()) return nullptr;
  return std::move(root_);
}

}  // namespace

Ref<Object> readXMLPropertyList(std::string_view bytes, Mutability mutability) {
  return Reader(mutability).parse(bytes);
}

}  // namespace qr
