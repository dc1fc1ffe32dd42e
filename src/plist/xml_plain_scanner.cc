// The scanner takes a construct only where it knows exactly what expat makes
// of it; at the first byte it is unsure of, it declines. It says malformed
// only where everything before was plain and expat would then either fail
// to parse or hand the value builder something it refuses.
#include "plist/xml_plain_scanner.h"

#include <string>

#include "plist/xml_tag_words.h"
#include "plist/xml_text_scan.h"
#include "plist/xml_value_builder.h"

namespace qr::xmlplist {
namespace {

using Outcome = PlainScan::Outcome;
// Within the scanner, Read means "go on".
constexpr Outcome Go = PlainScan::Read;
constexpr Outcome Malformed = PlainScan::Malformed;
constexpr Outcome Declined = PlainScan::Declined;

bool isSpace(char c) noexcept {
  constexpr uint64_t kSpaces = 1ull << ' ' | 1ull << '\t' | 1ull << '\n' | 1ull << '\r';
  auto u = static_cast<unsigned char>(c);
  return u <= ' ' && (kSpaces >> u & 1);
}
// The number of leading XML white-space bytes; indentation runs are short,
// so one look at 16 bytes usually finds their end.
size_t spaceRun(const char* s, size_t n) noexcept {
  size_t i = 0;
#ifdef __SSE2__
  for (; i + 16 <= n; i += 16) {
    const __m128i v = _mm_loadu_si128(reinterpret_cast<const __m128i*>(s + i));
    const __m128i space = _mm_or_si128(_mm_or_si128(_mm_cmpeq_epi8(v, _mm_set1_epi8('\t')),
                                                    _mm_cmpeq_epi8(v, _mm_set1_epi8('\n'))),
                                       _mm_or_si128(_mm_cmpeq_epi8(v, _mm_set1_epi8(' ')),
                                                    _mm_cmpeq_epi8(v, _mm_set1_epi8('\r'))));
    auto other = static_cast<unsigned>(~_mm_movemask_epi8(space)) & 0xFFFFu;
    if (other) return i + size_t(__builtin_ctz(other));
  }
#endif
  while (i < n && isSpace(s[i])) ++i;
  return i;
}

bool isLower(char c) noexcept { return c >= 'a' && c <= 'z'; }
bool isAlnum(char c) noexcept {
  return isLower(c) || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9');
}

int digitValue(char c, bool hex) noexcept {
  if (c >= '0' && c <= '9') return c - '0';
  if (!hex) return -1;
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

// The characters XML 1.0 allows, which are those a character reference may name.
bool isXMLChar(uint32_t c) noexcept {
  return c == 0x9 || c == 0xA || c == 0xD || (c >= 0x20 && c <= 0xD7FF) ||
         (c >= 0xE000 && c <= 0xFFFD) || (c >= 0x10000 && c <= 0x10FFFF);
}

void appendUTF8(std::string& out, uint32_t c) {
  if (c < 0x80) {
    out += static_cast<char>(c);
  } else if (c < 0x800) {
    out += static_cast<char>(0xC0 | (c >> 6));
    out += static_cast<char>(0x80 | (c & 0x3F));
  } else if (c < 0x10000) {
    out += static_cast<char>(0xE0 | (c >> 12));
    out += static_cast<char>(0x80 | ((c >> 6) & 0x3F));
    out += static_cast<char>(0x80 | (c & 0x3F));
  } else {
    out += static_cast<char>(0xF0 | (c >> 18));
    out += static_cast<char>(0x80 | ((c >> 12) & 0x3F));
    out += static_cast<char>(0x80 | ((c >> 6) & 0x3F));
    out += static_cast<char>(0x80 | (c & 0x3F));
  }
}

class Scanner {
 public:
  Scanner(std::string_view bytes, Mutability mutability)
      : p_(bytes.data()), end_(bytes.data() + bytes.size()), builder_(mutability) {}

  PlainScan run();

 private:
  size_t left() const noexcept { return static_cast<size_t>(end_ - p_); }
  // Byte by byte: the words compared are a few bytes long, and a library
  // call for each would cost more than the comparing.
  bool at(std::string_view s) const noexcept {
    if (left() < s.size()) return false;
    for (size_t i = 0; i < s.size(); ++i)
      if (p_[i] != s[i]) return false;
    return true;
  }
  bool skip(std::string_view s) noexcept {
    if (!at(s)) return false;
    p_ += s.size();
    return true;
  }
  // Whether there was any white space.
  bool skipSpace() noexcept {
    const char* from = p_;
    while (p_ < end_ && isSpace(*p_)) ++p_;
    return p_ != from;
  }

  bool prolog();
  bool xmlDeclaration();
  bool pseudoAttribute(std::string_view name, std::string_view& value);
  bool doctype();
  bool literal(bool publicId);
  bool plistStartTag(bool& empty);
  Outcome content();
  Outcome startTag();
  Outcome endTag(Tag tag);
  Outcome leaf(Tag tag);
  Outcome decodedLeaf(Tag tag, const char* start);
  Outcome closeLeaf(Tag tag, std::string_view text);
  bool utf8Character() noexcept;
  bool reference();

  const char* p_;
  const char* const end_;
  ValueBuilder builder_;
  std::string text_;  // of a leaf holding references or carriage returns
};

PlainScan Scanner::run() {
  if (!prolog() || !at("<plist")) return {Declined, nullptr};
  bool empty = false;
  if (!plistStartTag(empty)) return {Declined, nullptr};
  builder_.start(Tag::Plist);
  if (empty) return {Malformed, nullptr};  // <plist/> holds no value
  if (Outcome o = content(); o != Go) return {o, nullptr};
  // Comments and processing instructions may follow; expat reads those.
  skipSpace();
  if (p_ != end_) return {Declined, nullptr};
  return {PlainScan::Read, builder_.finish()};
}

bool Scanner::prolog() {
  skip("\xEF\xBB\xBF");
  if (at("<?xml") && !xmlDeclaration()) return false;
  skipSpace();
  if (at("<!DOCTYPE") && !doctype()) return false;
  skipSpace();
  return true;
}

bool Scanner::xmlDeclaration() {
  p_ += 5;
  std::string_view value;
  if (!pseudoAttribute("version", value) || value != "1.0") return false;
  const char* before = p_;
  if (pseudoAttribute("encoding", value)) {
    // expat compares encoding names without regard to case.
    if (value.size() != 5 || (value[0] | 0x20) != 'u' || (value[1] | 0x20) != 't' ||
        (value[2] | 0x20) != 'f' || value.substr(3) != "-8")
      return false;
  } else {
    p_ = before;
  }
  before = p_;
  if (pseudoAttribute("standalone", value)) {
    if (value != "yes" && value != "no") return false;
  } else {
    p_ = before;
  }
  skipSpace();
  return skip("?>");
}

// White space, the name, "=" with optional white space around it, and a
// quoted value of letters, digits, '.', '-' and '_'.
bool Scanner::pseudoAttribute(std::string_view name, std::string_view& value) {
  if (!skipSpace() || !skip(name)) return false;
  skipSpace();
  if (!skip("=")) return false;
  skipSpace();
  if (p_ == end_ || (*p_ != '"' && *p_ != '\'')) return false;
  char quote = *p_++;
  const char* start = p_;
  while (p_ < end_ && (isAlnum(*p_) || *p_ == '.' || *p_ == '-' || *p_ == '_')) ++p_;
  value = std::string_view(start, static_cast<size_t>(p_ - start));
  return skip(std::string_view(&quote, 1));
}

// "<!DOCTYPE plist", optionally a SYSTEM or PUBLIC identifier, and ">"; an
// internal subset is declined.
bool Scanner::doctype() {
  p_ += 9;
  if (!skipSpace() || !skip("plist")) return false;
  if (skipSpace()) {
    bool isPublic = at("PUBLIC");
    if (isPublic || at("SYSTEM")) {
      p_ += 6;
      if (!skipSpace()) return false;
      if (isPublic && (!literal(true) || !skipSpace())) return false;
      if (!literal(false)) return false;
      skipSpace();
    }
  }
  return skip(">");
}

// A quoted identifier of printable ASCII; a public one only of the characters
// XML allows there (less the apostrophe, and line breaks).
bool Scanner::literal(bool publicId) {
  if (p_ == end_ || (*p_ != '"' && *p_ != '\'')) return false;
  char quote = *p_++;
  constexpr std::string_view kPublic = " -()+,./:=?;!*#@$_%";
  constexpr std::string_view kSystem = " -._~:/?=+,;!*()@$";
  std::string_view allowed = publicId ? kPublic : kSystem;
  while (p_ < end_ && *p_ != quote) {
    if (!isAlnum(*p_) && allowed.find(*p_) == std::string_view::npos) return false;
    ++p_;
  }
  return skip(std::string_view(&quote, 1));
}

// "<plist", optionally a version attribute, and ">" or "/>".
bool Scanner::plistStartTag(bool& empty) {
  p_ += 6;
  if (skipSpace() && skip("version")) {
    skipSpace();
    if (!skip("=")) return false;
    skipSpace();
    if (p_ == end_ || (*p_ != '"' && *p_ != '\'')) return false;
    char quote = *p_++;
    while (p_ < end_ && ((*p_ >= '0' && *p_ <= '9') || *p_ == '.')) ++p_;
    if (!skip(std::string_view(&quote, 1))) return false;
    skipSpace();
  }
  empty = at("/>");
  return skip(empty ? "/>" : ">");
}

Outcome Scanner::content() {
  for (;;) {
    // Between elements, white space only: other text makes the reader fail,
    // though a reference may stand for white space.
    p_ += spaceRun(p_, left());
    if (p_ == end_) return Malformed;  // the document ends inside <plist>
    if (*p_ != '<') return *p_ == '&' ? Declined : Malformed;
    if (++p_ == end_) return Malformed;
    if (*p_ != '/') {
      if (Outcome o = startTag(); o != Go) return o;
      continue;
    }
    if (Outcome o = endTag(builder_.openContainer()); o != Go) return o;
    if (!builder_.endContainer()) return Malformed;
    if (builder_.openContainer() == Tag::Unknown) return Go;  // </plist>
  }
}

// After "<": a name of lower-case letters, optional white space, and ">" or
// "/>". Comments, processing instructions, CDATA, other names and attributes
// are declined.
Outcome Scanner::startTag() {
  Tag tag;
  bool empty;
  if (const Opening* o = left() >= 16 ? findOpening(p_) : nullptr) {
    p_ += o->words.length;
    tag = o->tag;
    empty = o->empty;
  } else {
    const char* name = p_;
    while (p_ < end_ && isLower(*p_)) ++p_;
    if (p_ == end_) return Malformed;
    if (p_ == name || (*p_ != '>' && *p_ != '/' && !isSpace(*p_))) return Declined;
    tag = tagOf(std::string_view(name, static_cast<size_t>(p_ - name)));
    skipSpace();
    empty = at("/>");
    if (!skip(empty ? "/>" : ">")) return Declined;
  }
  if (!builder_.start(tag)) return Malformed;
  if (isContainer(tag)) return !empty || builder_.endContainer() ? Go : Malformed;
  if (empty) return builder_.endLeaf({}) ? Go : Malformed;
  return leaf(tag);
}

// After "<": the end tag of the open element; anything else there is an
// error to expat.
Outcome Scanner::endTag(Tag tag) {
  if (tag == Tag::Unknown) return Malformed;
  const TagWords& words = kClosings[static_cast<size_t>(tag)];
  if (left() >= 16 && words.matches(p_)) {
    p_ += words.length;
    return Go;
  }
  if (!skip("/") || !skip(nameOf(tag))) return Malformed;
  skipSpace();
  return skip(">") ? Go : Malformed;
}

// The text of a leaf element up to its end tag. Text without references or
// carriage returns is taken where it lies.
Outcome Scanner::leaf(Tag tag) {
  const char* start = p_;
  for (;;) {
    p_ += plainRun(p_, left());
    if (p_ == end_) return Malformed;
    auto c = static_cast<unsigned char>(*p_);
    if (c == '<') return closeLeaf(tag, std::string_view(start, static_cast<size_t>(p_ - start)));
    if (c == '\t' || c == '\n') {
      ++p_;
    } else if (c >= 0x80) {
      if (!utf8Character()) return Declined;
    } else if (c == '>') {
      if (p_ - start >= 2 && p_[-1] == ']' && p_[-2] == ']') return Declined;  // "]]>"
      ++p_;
    } else if (c == '&' || c == '\r') {
      return decodedLeaf(tag, start);
    } else {
      return Declined;  // a control character
    }
  }
}

// The same, from the first reference or carriage return on, into text_:
// references replaced, and line breaks made line feeds as expat makes them.
Outcome Scanner::decodedLeaf(Tag tag, const char* start) {
  text_.assign(start, p_);
  for (;;) {
    const char* run = p_;
    p_ += plainRun(p_, left());
    text_.append(run, p_);
    if (p_ == end_) return Malformed;
    auto c = static_cast<unsigned char>(*p_);
    if (c == '<') return closeLeaf(tag, text_);
    if (c == '\t' || c == '\n') {
      text_ += *p_++;
    } else if (c == '\r') {
      text_ += '\n';
      ++p_;
      if (p_ < end_ && *p_ == '\n') ++p_;
    } else if (c >= 0x80) {
      run = p_;
      if (!utf8Character()) return Declined;
      text_.append(run, p_);
    } else if (c == '>') {
      if (p_ - start >= 2 && p_[-1] == ']' && p_[-2] == ']') return Declined;
      text_ += *p_++;
    } else if (c != '&' || !reference()) {
      return Declined;
    }
  }
}

// At the "<" after a leaf's text.
Outcome Scanner::closeLeaf(Tag tag, std::string_view text) {
  if (++p_ == end_) return Malformed;
  // A comment, processing instruction or CDATA section may go on with the
  // text; anything else but the end tag is an element, which no leaf may hold,
  // or an error.
  if (*p_ == '!' || *p_ == '?') return Declined;
  if (Outcome o = endTag(tag); o != Go) return o;
  return builder_.endLeaf(text) ? Go : Malformed;
}

// One well-formed UTF-8 sequence of a character XML allows (surrogates and
// U+FFFE / U+FFFF excluded, as expat excludes them).
bool Scanner::utf8Character() noexcept {
  auto byte = [this](size_t i) { return static_cast<unsigned char>(p_[i]); };
  auto follows = [&](size_t i, unsigned low, unsigned high) {
    return i < left() && byte(i) >= low && byte(i) <= high;
  };
  unsigned c = byte(0);
  size_t n;
  if (c >= 0xC2 && c <= 0xDF) {
    n = 2;
    if (!follows(1, 0x80, 0xBF)) return false;
  } else if (c >= 0xE0 && c <= 0xEF) {
    n = 3;
    if (!follows(1, c == 0xE0 ? 0xA0 : 0x80, c == 0xED ? 0x9F : 0xBF) || !follows(2, 0x80, 0xBF))
      return false;
    if (c == 0xEF && byte(1) == 0xBF && byte(2) >= 0xBE) return false;
  } else if (c >= 0xF0 && c <= 0xF4) {
    n = 4;
    if (!follows(1, c == 0xF0 ? 0x90 : 0x80, c == 0xF4 ? 0x8F : 0xBF) || !follows(2, 0x80, 0xBF) ||
        !follows(3, 0x80, 0xBF))
      return false;
  } else {
    return false;
  }
  p_ += n;
  return true;
}

// At "&": a predefined entity or a character reference, appended to text_.
bool Scanner::reference() {
  static constexpr std::pair<std::string_view, char> kEntities[] = {
      {"&amp;", '&'}, {"&lt;", '<'}, {"&gt;", '>'}, {"&quot;", '"'}, {"&apos;", '\''}};
  for (const auto& [entity, c] : kEntities) {
    if (skip(entity)) {
      text_ += c;
      return true;
    }
  }
  if (!skip("&#")) return false;
  bool hex = skip("x");
  uint32_t c = 0;
  const char* digits = p_;
  for (int d; p_ < end_ && (d = digitValue(*p_, hex)) >= 0; ++p_) {
    c = c * (hex ? 16 : 10) + static_cast<uint32_t>(d);
    if (c > 0x10FFFF) return false;
  }
  if (p_ == digits || !skip(";") || !isXMLChar(c)) return false;
  appendUTF8(text_, c);
  return true;
}

}  // namespace

PlainScan scanPlainXMLPropertyList(std::string_view bytes, Mutability mutability) {
  try {
    return Scanner(bytes, mutability).run();
  } catch (...) {  // out of memory, or a dictionary too large: expat's turn
    return {PlainScan::Declined, nullptr};
  }
}

}  // namespace qr::xmlplist
