// The XML property-list reader for every form XML allows: libexpat
// tokenizes, and the handlers below feed the value builder. Anything outside
// the property-list vocabulary stops the parse with null. Most files are in
// the plain form, which the plain scanner reads without expat first.
#include <expat.h>

#include <algorithm>
#include <cstring>
#include <string>

#include "plist/property_list.h"
#include "plist/xml_expat_reader.h"
#include "plist/xml_plain_scanner.h"
#include "plist/xml_value_builder.h"

namespace qr {
namespace {

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
  explicit Reader(Mutability mutability) : builder_(mutability) {}

  Ref<Object> parse(std::string_view bytes);

 private:
  static void XMLCALL onStart(void* self, const XML_Char* name, const XML_Char** attributes);
  static void XMLCALL onEnd(void* self, const XML_Char* name);
  static void XMLCALL onText(void* self, const XML_Char* text, int length);
  static void XMLCALL onDoctype(void* self, const XML_Char* name, const XML_Char* systemId,
                                const XML_Char* publicId, int hasInternalSubset);
  static void XMLCALL onEntityDecl(void* self, const XML_Char*, int, const XML_Char*, int,
                                   const XML_Char*, const XML_Char*, const XML_Char*,
                                   const XML_Char*);
  static void XMLCALL onSkippedEntity(void* self, const XML_Char*, int);

  void fail() noexcept {
    if (!failed_) XML_StopParser(parser_, XML_FALSE);
    failed_ = true;
  }

  XML_Parser parser_ = nullptr;
  bool failed_ = false;
  size_t events_ = 0;
  xmlplist::ValueBuilder builder_;
  std::string text_;  // of the open leaf element
};

void XMLCALL Reader::onStart(void* self, const XML_Char* name, const XML_Char**) {
  auto* r = static_cast<Reader*>(self);
  ++r->events_;
  if (r->failed_) return;
  try {
    if (!r->builder_.start(xmlplist::tagOf(name))) return r->fail();
    r->text_.clear();
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
    bool ok = r->builder_.openLeaf() != xmlplist::Tag::Unknown ? r->builder_.endLeaf(r->text_)
                                                               : r->builder_.endContainer();
    if (!ok) r->fail();
  } catch (...) {
    r->fail();
  }
}

void XMLCALL Reader::onText(void* self, const XML_Char* text, int length) {
  auto* r = static_cast<Reader*>(self);
  ++r->events_;
  if (r->failed_) return;
  if (r->builder_.openLeaf() == xmlplist::Tag::Unknown) {
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
  if (failed_) return nullptr;
  return builder_.finish();
}

}  // namespace

Ref<Object> readXMLPropertyListWithExpat(std::string_view bytes, Mutability mutability) {
  return Reader(mutability).parse(bytes);
}

Ref<Object> readXMLPropertyList(std::string_view bytes, Mutability mutability) {
  {
    // Scoped, so that what a declined scan built is gone before expat starts.
    xmlplist::PlainScan scan = xmlplist::scanPlainXMLPropertyList(bytes, mutability);
    if (scan.outcome != xmlplist::PlainScan::Declined) return std::move(scan.value);
  }
  return readXMLPropertyListWithExpat(bytes, mutability);
}

}  // namespace qr
