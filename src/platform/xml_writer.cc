// The canonical XML property-list writer. It refuses, rather than writes
// something no reader accepts: values that are not property-list values,
// non-string keys, text that XML 1.0 cannot carry, nesting beyond the
// readers' limit, and dates outside the four-digit years.
#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstring>
#include <vector>

#include "platform/array.h"
#include "platform/boolean.h"
#include "platform/data.h"
#include "platform/date.h"
#include "platform/dictionary.h"
#include "platform/number.h"
#include "platform/output_blocks.h"
#include "platform/property_list.h"
#include "platform/string.h"
#include "platform/xml_leaf_text.h"

namespace qr {
namespace {

// What an ASCII character needs in element text.
enum : uint8_t { kPlain, kEscape, kForbidden };

struct AsciiClasses {
  uint8_t of[128];
  constexpr AsciiClasses() : of() {
    for (int c = 0; c < 0x20; ++c) of[c] = kForbidden;
    of[int('\t')] = of[int('\n')] = kPlain;
    // A raw carriage return would come back as a line feed.
    of[int('\r')] = of[int('&')] = of[int('<')] = of[int('>')] = kEscape;
  }
};
constexpr AsciiClasses kAscii;

// Longest escape ("&amp;", "&#13;") and longest UTF-8 per code unit, which
// bounds what one code unit can turn into.
constexpr size_t kMaxBytesPerUnit = 5;
// Text goes out in pieces so that the room reserved stays bounded.
constexpr size_t kTextPiece = 64 * 1024;

char* escape(char c, char* p) noexcept {
  const char* e = c == '&' ? "&amp;" : c == '<' ? "&lt;" : c == '>' ? "&gt;" : "&#13;";
  size_t n = c == '<' || c == '>' ? 4 : 5;
  std::memcpy(p, e, n);
  return p + n;
}

class Writer {
 public:
  bool value(const Object& v, size_t depth);
  std::string finish() { return out_.finish(); }
  template <size_t N>
  void put(const char (&literal)[N]) {
    char* p = out_.reserve(N - 1);
    std::memcpy(p, literal, N - 1);
    out_.commit(p + N - 1);
  }

 private:
  // Indentation, then the literal.
  template <size_t N>
  void line(size_t indent, const char (&literal)[N]) {
    char* p = out_.reserve(indent + N - 1);
    std::memset(p, '\t', indent);
    std::memcpy(p + indent, literal, N - 1);
    out_.commit(p + indent + N - 1);
  }
  bool text(const String& s);
  bool narrowText(std::string_view s);
  bool wideText(std::u16string_view s);
  bool number(const Number& n, size_t indent);
  bool date(const Date& d, size_t indent);
  void data(const Data& d, size_t indent);
  bool array(const Array& a, size_t depth);
  bool dictionary(const Dictionary& d, size_t depth);

  OutputBlocks out_;
  // Entries of the dictionaries being written, innermost last, for sorting.
  std::vector<std::pair<const String*, const Object*>> entries_;
};

bool Writer::value(const Object& v, size_t depth) {
  if (depth > kMaxPropertyListDepth) return false;
  size_t indent = depth - 1;
  switch (v.kind()) {
    case TypeKind::String:
      line(indent, "<string>");
      if (!text(static_cast<const String&>(v))) return false;
      put("</string>\n");
      return true;
    case TypeKind::Number:
      return number(static_cast<const Number&>(v), indent);
    case TypeKind::Boolean:
      if (static_cast<const Boolean&>(v).value())
        line(indent, "<true/>\n");
      else
        line(indent, "<false/>\n");
      return true;
    case TypeKind::Data:
      data(static_cast<const Data&>(v), indent);
      return true;
    case TypeKind::Date:
      return date(static_cast<const Date&>(v), indent);
    case TypeKind::Array:
      return array(static_cast<const Array&>(v), depth);
    case TypeKind::Dictionary:
      return dictionary(static_cast<const Dictionary&>(v), depth);
    default:
      return false;  // URLs, UUIDs and every other object
  }
}

bool Writer::text(const String& s) {
  return s.isNarrow() ? narrowText(s.narrow()) : wideText(s.wide());
}

bool Writer::narrowText(std::string_view s) {
  const auto* bytes = reinterpret_cast<const unsigned char*>(s.data());
  size_t i = 0;
  while (i < s.size()) {
    size_t end = std::min(s.size(), i + kTextPiece);
    char* p = out_.reserve((end - i) * kMaxBytesPerUnit);
    while (i < end) {
      size_t run = i;
      while (run < end && kAscii.of[bytes[run]] == kPlain) ++run;
      std::memcpy(p, bytes + i, run - i);
      p += run - i;
      i = run;
      if (i == end) break;
      if (kAscii.of[bytes[i]] == kForbidden) return false;
      p = escape(static_cast<char>(bytes[i++]), p);
    }
    out_.commit(p);
  }
  return true;
}

bool Writer::wideText(std::u16string_view s) {
  size_t i = 0;
  while (i < s.size()) {
    size_t end = std::min(s.size(), i + kTextPiece);
    char* p = out_.reserve((end - i + 1) * kMaxBytesPerUnit);
    for (; i < end; ++i) {
      uint32_t c = s[i];
      if (c < 0x80) {
        uint8_t cls = kAscii.of[c];
        if (cls == kForbidden) return false;
        if (cls == kEscape)
          p = escape(static_cast<char>(c), p);
        else
          *p++ = static_cast<char>(c);
      } else if (c < 0x800) {
        *p++ = static_cast<char>(0xC0 | (c >> 6));
        *p++ = static_cast<char>(0x80 | (c & 0x3F));
      } else if (c >= 0xD800 && c <= 0xDFFF) {
        // Only a high surrogate followed by a low one is a character.
        if (c >= 0xDC00 || i + 1 >= s.size() || s[i + 1] < 0xDC00 || s[i + 1] > 0xDFFF)
          return false;
        uint32_t cp = 0x10000 + ((c - 0xD800) << 10) + (s[++i] - 0xDC00u);
        *p++ = static_cast<char>(0xF0 | (cp >> 18));
        *p++ = static_cast<char>(0x80 | ((cp >> 12) & 0x3F));
        *p++ = static_cast<char>(0x80 | ((cp >> 6) & 0x3F));
        *p++ = static_cast<char>(0x80 | (cp & 0x3F));
      } else {
        if (c == 0xFFFE || c == 0xFFFF) return false;
        *p++ = static_cast<char>(0xE0 | (c >> 12));
        *p++ = static_cast<char>(0x80 | ((c >> 6) & 0x3F));
        *p++ = static_cast<char>(0x80 | (c & 0x3F));
      }
    }
    out_.commit(p);
  }
  return true;
}

bool Writer::number(const Number& n, size_t indent) {
  constexpr size_t kRoom = 16 + xmlplist::kMaxRealText;
  char* p = out_.reserve(indent + kRoom);
  std::memset(p, '\t', indent);
  p += indent;
  if (n.isReal()) {
    std::memcpy(p, "<real>", 6);
    p = xmlplist::formatReal(n.doubleValue(), p + 6);
    std::memcpy(p, "</real>\n", 8);
    out_.commit(p + 8);
    return true;
  }
  std::memcpy(p, "<integer>", 9);
  p += 9;
  p = n.isUnsigned() ? std::to_chars(p, p + 20, n.uint64Value()).ptr
                     : std::to_chars(p, p + 20, n.int64Value()).ptr;
  std::memcpy(p, "</integer>\n", 11);
  out_.commit(p + 11);
  return true;
}

bool Writer::date(const Date& d, size_t indent) {
  if (!std::isfinite(d.secondsSinceReference())) return false;
  std::string iso = d.iso8601();
  // Years before 0 or after 9999 have no form that readers accept.
  if (!Date::fromISO8601(iso)) return false;
  line(indent, "<date>");
  out_.append(iso.data(), iso.size());
  put("</date>\n");
  return true;
}

void Writer::data(const Data& d, size_t indent) {
  // "<data>", then the base64 in lines of kBase64LineLength characters at the
  // element's own indentation, then "</data>".
  constexpr size_t kLineBytes = xmlplist::kBase64LineLength / 4 * 3;
  line(indent, "<data>\n");
  const uint8_t* bytes = d.bytes();
  for (size_t left = d.length(); left > 0;) {
    size_t n = std::min(left, kLineBytes);
    char* p = out_.reserve(indent + xmlplist::kBase64LineLength + 1);
    std::memset(p, '\t', indent);
    p = xmlplist::encodeBase64(bytes, n, p + indent);
    *p++ = '\n';
    out_.commit(p);
    bytes += n;
    left -= n;
  }
  line(indent, "</data>\n");
}

bool Writer::array(const Array& a, size_t depth) {
  size_t indent = depth - 1;
  if (a.isEmpty()) {
    line(indent, "<array/>\n");
    return true;
  }
  line(indent, "<array>\n");
  for (const auto& item : a)
    if (!value(*item, depth + 1)) return false;
  line(indent, "</array>\n");
  return true;
}

bool Writer::dictionary(const Dictionary& d, size_t depth) {
  size_t indent = depth - 1;
  if (d.isEmpty()) {
    line(indent, "<dict/>\n");
    return true;
  }
  size_t first = entries_.size();
  bool stringKeys = true;
  d.forEach([&](const Object& k, const Object& v) {
    if (k.kind() == TypeKind::String)
      entries_.emplace_back(static_cast<const String*>(&k), &v);
    else
      stringKeys = false;
  });
  if (!stringKeys) return false;
  std::sort(entries_.begin() + ptrdiff_t(first), entries_.end(),
            [](const auto& a, const auto& b) { return a.first->compare(*b.first) < 0; });
  line(indent, "<dict>\n");
  // Index rather than iterate: nested dictionaries append to entries_.
  for (size_t i = first, end = entries_.size(); i < end; ++i) {
    line(indent + 1, "<key>");
    if (!text(*entries_[i].first)) return false;
    put("</key>\n");
    if (!value(*entries_[i].second, depth + 1)) return false;
  }
  entries_.resize(first);
  line(indent, "</dict>\n");
  return true;
}

}  // namespace

std::optional<std::string> writeXMLPropertyList(const Object& value) {
  try {
    Writer w;
    w.put("<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n");
    if (!w.value(value, 1)) return std::nullopt;
    w.put("</plist>\n");
    return w.finish();
  } catch (const std::bad_alloc&) {
    return std::nullopt;
  }
}

}  // namespace qr
