// The canonical XML property-list writer. It refuses, rather than writes
// something no reader accepts: values that are not property-list values,
// non-string keys, text that XML 1.0 cannot carry, nesting beyond the
// readers' limit, and dates outside the four-digit years.
//
// The value is walked twice by the same code: once into a counter, which
// also finds anything unwritable, and once into a string of exactly the
// counted size. Large outputs thus cost one allocation and one touch of
// each page, and never a copy.
#include <sys/mman.h>

#include <algorithm>
#include <charconv>
#include <cmath>
#include <cstdint>
#include <cstring>
#include <functional>
#include <memory>
#include <vector>

#include "plist/property_list.h"
#include "plist/xml_leaf_text.h"
#include "plist/xml_text_scan.h"
#include "values/array.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/dictionary.h"
#include "values/number.h"
#include "values/string.h"

namespace qr {
namespace {

using xmlplist::kAsciiClass;
using xmlplist::kEscape;
using xmlplist::kForbidden;

std::string_view escapeFor(char c) noexcept {
  switch (c) {
    case '&':
      return "&amp;";
    case '<':
      return "&lt;";
    case '>':
      return "&gt;";
    default:
      return "&#13;";  // a raw carriage return would read back as a line feed
  }
}

// The first pass: counts bytes and writes nothing.
class Counter {
 public:
  static constexpr bool kSortsKeys = false;  // the order does not change the size
  void put(std::string_view s) noexcept { n_ += s.size(); }
  void tabs(size_t n) noexcept { n_ += n; }
  void base64(const uint8_t*, size_t n) noexcept { n_ += xmlplist::base64Length(n); }
  void utf8(uint32_t codePoint) noexcept {
    n_ += codePoint < 0x800 ? 2 : codePoint < 0x10000 ? 3 : 4;
  }
  size_t size() const noexcept { return n_; }

 private:
  size_t n_ = 0;
};

// The second pass: writes into the room the first pass counted. A value
// changed by another thread in between could need more; the printer then
// stops instead of overrunning, and the write fails.
class Printer {
 public:
  static constexpr bool kSortsKeys = true;
  Printer(char* begin, char* end) noexcept : p_(begin), end_(end) {}
  void put(std::string_view s) noexcept {
    if (!room(s.size())) return;
    std::memcpy(p_, s.data(), s.size());
    p_ += s.size();
  }
  void tabs(size_t n) noexcept {
    if (!room(n)) return;
    std::memset(p_, '\t', n);
    p_ += n;
  }
  void base64(const uint8_t* bytes, size_t n) noexcept {
    if (room(xmlplist::base64Length(n))) p_ = xmlplist::encodeBase64(bytes, n, p_);
  }
  void utf8(uint32_t c) noexcept {
    if (c < 0x800) {
      if (room(2)) {
        *p_++ = static_cast<char>(0xC0 | (c >> 6));
        *p_++ = static_cast<char>(0x80 | (c & 0x3F));
      }
    } else if (c < 0x10000) {
      if (room(3)) {
        *p_++ = static_cast<char>(0xE0 | (c >> 12));
        *p_++ = static_cast<char>(0x80 | ((c >> 6) & 0x3F));
        *p_++ = static_cast<char>(0x80 | (c & 0x3F));
      }
    } else if (room(4)) {
      *p_++ = static_cast<char>(0xF0 | (c >> 18));
      *p_++ = static_cast<char>(0x80 | ((c >> 12) & 0x3F));
      *p_++ = static_cast<char>(0x80 | ((c >> 6) & 0x3F));
      *p_++ = static_cast<char>(0x80 | (c & 0x3F));
    }
  }
  bool filledExactly() const noexcept { return !overflow_ && p_ == end_; }

 private:
  bool room(size_t n) noexcept {
    if (n <= static_cast<size_t>(end_ - p_)) return true;
    overflow_ = true;
    return false;
  }
  char* p_;
  char* end_;
  bool overflow_ = false;
};

// Writes through a buffer of its own into a sink, for outputs that go
// straight to a file: no room for the whole text is ever made.
class Streamer {
 public:
  static constexpr bool kSortsKeys = true;
  explicit Streamer(const std::function<bool(std::string_view)>& sink)
      : sink_(sink), buffer_(new char[kChunk]), p_(buffer_.get()) {}
  void put(std::string_view s) {
    if (!room(s.size())) {
      if (ok_) ok_ = sink_(s);
      return;
    }
    std::memcpy(p_, s.data(), s.size());
    p_ += s.size();
  }
  void tabs(size_t n) {  // at most the nesting limit
    if (room(n)) {
      std::memset(p_, '\t', n);
      p_ += n;
    }
  }
  void base64(const uint8_t* bytes, size_t n) {
    if (room(xmlplist::base64Length(n))) p_ = xmlplist::encodeBase64(bytes, n, p_);
  }
  void utf8(uint32_t c) {
    if (!room(4)) return;
    Printer printer(p_, p_ + 4);
    printer.utf8(c);
    p_ += c < 0x800 ? 2 : c < 0x10000 ? 3 : 4;
  }
  // False when the sink refused any part.
  bool finish() {
    flush();
    return ok_;
  }

 private:
  // Larger than any one piece the walker puts, but for long text.
  static constexpr size_t kChunk = size_t(1) << 20;
  // Whether n more bytes fit, after flushing if need be.
  bool room(size_t n) {
    if (n <= size_t(buffer_.get() + kChunk - p_)) return true;
    flush();
    return n <= kChunk;
  }
  void flush() {
    if (ok_ && p_ != buffer_.get()) ok_ = sink_({buffer_.get(), size_t(p_ - buffer_.get())});
    p_ = buffer_.get();
  }
  const std::function<bool(std::string_view)>& sink_;
  std::unique_ptr<char[]> buffer_;
  char* p_;
  bool ok_ = true;
};

template <class Out>
class Walker {
 public:
  explicit Walker(Out& out) : out_(out) {}
  bool value(const Object& v, size_t depth);

 private:
  bool text(const String& s);
  bool narrowText(std::string_view s);
  bool wideText(std::u16string_view s);
  bool number(const Number& n);
  bool date(const Date& d);
  void data(const Data& d, size_t indent);
  bool array(const Array& a, size_t depth);
  bool dictionary(const Dictionary& d, size_t depth);

  Out& out_;
  // Entries of the dictionaries being written, innermost last, for sorting.
  std::vector<std::pair<const String*, const Object*>> entries_;
};

template <class Out>
bool Walker<Out>::value(const Object& v, size_t depth) {
  if (depth > kMaxPropertyListDepth) return false;
  size_t indent = depth - 1;
  out_.tabs(indent);
  switch (v.kind()) {
    case TypeKind::String:
      out_.put("<string>");
      if (!text(static_cast<const String&>(v))) return false;
      out_.put("</string>\n");
      return true;
    case TypeKind::Number:
      return number(static_cast<const Number&>(v));
    case TypeKind::Boolean:
      out_.put(static_cast<const Boolean&>(v).value() ? "<true/>\n" : "<false/>\n");
      return true;
    case TypeKind::Data:
      data(static_cast<const Data&>(v), indent);
      return true;
    case TypeKind::Date:
      return date(static_cast<const Date&>(v));
    case TypeKind::Array:
      return array(static_cast<const Array&>(v), depth);
    case TypeKind::Dictionary:
      return dictionary(static_cast<const Dictionary&>(v), depth);
    default:
      return false;  // URLs, UUIDs and every other object
  }
}

template <class Out>
bool Walker<Out>::text(const String& s) {
  return s.isNarrow() ? narrowText(s.narrow()) : wideText(s.wide());
}

template <class Out>
bool Walker<Out>::narrowText(std::string_view s) {
  while (!s.empty()) {
    size_t run = xmlplist::plainRun(s.data(), s.size());
    out_.put(s.substr(0, run));
    if (run == s.size()) break;
    char c = s[run];
    uint8_t cls = kAsciiClass[static_cast<unsigned char>(c)];
    if (cls == kForbidden) return false;
    out_.put(cls == kEscape ? escapeFor(c) : std::string_view(&s[run], 1));
    s.remove_prefix(run + 1);
  }
  return true;
}

template <class Out>
bool Walker<Out>::wideText(std::u16string_view s) {
  for (size_t i = 0; i < s.size(); ++i) {
    uint32_t c = s[i];
    if (c < 0x80) {
      char ascii = static_cast<char>(c);
      uint8_t cls = kAsciiClass[c];
      if (cls == kForbidden) return false;
      out_.put(cls == kEscape ? escapeFor(ascii) : std::string_view(&ascii, 1));
    } else if (c >= 0xD800 && c <= 0xDFFF) {
      // Only a high surrogate followed by a low one is a character.
      if (c >= 0xDC00 || i + 1 >= s.size() || s[i + 1] < 0xDC00 || s[i + 1] > 0xDFFF) return false;
      out_.utf8(0x10000 + ((c - 0xD800) << 10) + (s[++i] - 0xDC00u));
    } else {
      if (c == 0xFFFE || c == 0xFFFF) return false;
      out_.utf8(c);
    }
  }
  return true;
}

template <class Out>
bool Walker<Out>::number(const Number& n) {
  char buf[xmlplist::kMaxRealText];
  if (n.isReal()) {
    out_.put("<real>");
    out_.put({buf, size_t(xmlplist::formatReal(n.doubleValue(), buf) - buf)});
    out_.put("</real>\n");
    return true;
  }
  auto end = n.isUnsigned() ? std::to_chars(buf, buf + sizeof buf, n.uint64Value()).ptr
                            : std::to_chars(buf, buf + sizeof buf, n.int64Value()).ptr;
  out_.put("<integer>");
  out_.put({buf, size_t(end - buf)});
  out_.put("</integer>\n");
  return true;
}

template <class Out>
bool Walker<Out>::date(const Date& d) {
  if (!std::isfinite(d.secondsSinceReference())) return false;
  std::string iso = d.iso8601();
  // Years before 0 or after 9999 have no form that readers accept.
  if (!Date::fromISO8601(iso)) return false;
  out_.put("<date>");
  out_.put(iso);
  out_.put("</date>\n");
  return true;
}

template <class Out>
void Walker<Out>::data(const Data& d, size_t indent) {
  // "<data>", then the base64 in lines of kBase64LineLength characters at the
  // element's own indentation, then "</data>".
  constexpr size_t kLineBytes = xmlplist::kBase64LineLength / 4 * 3;
  out_.put("<data>\n");
  const uint8_t* bytes = d.bytes();
  for (size_t left = d.length(); left > 0;) {
    size_t n = std::min(left, kLineBytes);
    out_.tabs(indent);
    out_.base64(bytes, n);
    out_.put("\n");
    bytes += n;
    left -= n;
  }
  out_.tabs(indent);
  out_.put("</data>\n");
}

template <class Out>
bool Walker<Out>::array(const Array& a, size_t depth) {
  if (a.isEmpty()) {
    out_.put("<array/>\n");
    return true;
  }
  out_.put("<array>\n");
  for (const auto& item : a)
    if (!value(*item, depth + 1)) return false;
  out_.tabs(depth - 1);
  out_.put("</array>\n");
  return true;
}

template <class Out>
bool Walker<Out>::dictionary(const Dictionary& d, size_t depth) {
  if (d.isEmpty()) {
    out_.put("<dict/>\n");
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
  if constexpr (Out::kSortsKeys)
    std::sort(entries_.begin() + ptrdiff_t(first), entries_.end(),
              [](const auto& a, const auto& b) { return a.first->compare(*b.first) < 0; });
  out_.put("<dict>\n");
  // Index rather than iterate: nested dictionaries append to entries_.
  for (size_t i = first, end = entries_.size(); i < end; ++i) {
    out_.tabs(depth);
    out_.put("<key>");
    if (!text(*entries_[i].first)) return false;
    out_.put("</key>\n");
    if (!value(*entries_[i].second, depth + 1)) return false;
  }
  entries_.resize(first);
  out_.tabs(depth - 1);
  out_.put("</dict>\n");
  return true;
}

constexpr std::string_view kHead =
    "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n<plist version=\"1.0\">\n";
constexpr std::string_view kTail = "</plist>\n";

// Asks for huge pages behind a large output buffer that this writer alone
// owns: where first touches of memory are costly (virtual machines), one
// fault per 2 MiB instead of per 4 KiB is most of the writing time. Below
// 32 MiB the allocator may serve the buffer from its shared heap, which is
// left alone.
void adviseHugePages(char* p, size_t n) noexcept {
  constexpr uintptr_t kHuge = uintptr_t(2) << 20;
  if (n < (size_t(32) << 20)) return;
  uintptr_t begin = (reinterpret_cast<uintptr_t>(p) + kHuge - 1) & ~(kHuge - 1);
  uintptr_t end = (reinterpret_cast<uintptr_t>(p) + n) & ~(kHuge - 1);
  if (end > begin) madvise(reinterpret_cast<void*>(begin), end - begin, MADV_HUGEPAGE);
}

}  // namespace

bool canWriteXMLPropertyList(const Object& value) {
  Counter counter;
  return Walker<Counter>(counter).value(value, 1);
}

std::optional<std::string> writeXMLPropertyList(const Object& value) {
  try {
    Counter counter;
    if (!Walker<Counter>(counter).value(value, 1)) return std::nullopt;
    size_t size = kHead.size() + counter.size() + kTail.size();
    std::string out;
    out.reserve(size);
    adviseHugePages(out.data(), size);
    out.resize(size);
    Printer printer(out.data(), out.data() + size);
    printer.put(kHead);
    if (!Walker<Printer>(printer).value(value, 1)) return std::nullopt;
    printer.put(kTail);
    if (!printer.filledExactly()) return std::nullopt;
    return out;
  } catch (const std::bad_alloc&) {
    return std::nullopt;
  }
}

bool writeXMLPropertyList(const Object& value, const std::function<bool(std::string_view)>& sink) {
  try {
    // Checked whole first, so that nothing reaches the sink for a value that
    // cannot be written.
    if (!canWriteXMLPropertyList(value)) return false;
    Streamer streamer(sink);
    streamer.put(kHead);
    if (!Walker<Streamer>(streamer).value(value, 1)) return false;
    streamer.put(kTail);
    return streamer.finish();
  } catch (const std::bad_alloc&) {
    return false;
  }
}

}  // namespace qr
