// Reads the old text format: quoted and unquoted strings, <hex data>,
// ( arrays ) and { key = value; } dictionaries, with // and /* */ comments. A
// document of bare key = value; pairs is a .strings table and reads as a
// dictionary. Recursion only follows nesting, which is bounded before it
// goes deeper, so hostile nesting fails instead of exhausting the stack.
#include <utility>
#include <vector>

#include "plist/property_list.h"
#include "plist/text_decoding.h"
#include "values/array.h"
#include "values/data.h"
#include "values/dictionary.h"
#include "values/string.h"

namespace qr {
namespace {

constexpr int kEnd = -1;

bool isUnquotedChar(int c) {
  return (c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9') || c == '_' ||
         c == '$' || c == '+' || c == '/' || c == ':' || c == '.' || c == '-';
}

bool isSpace(int c) {
  return c == ' ' || c == '\t' || c == '\n' || c == '\r' || c == '\v' || c == '\f' || c == 0x2028 ||
         c == 0x2029;
}

bool isLineEnd(int c) { return c == '\n' || c == '\r' || c == 0x2028 || c == 0x2029; }

int hexValue(int c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

using Pairs = std::vector<std::pair<Ref<Object>, Ref<Object>>>;

class TextParser {
 public:
  TextParser(std::u16string_view text, Mutability mutability)
      : text_(text),
        mutableContainers_(mutability != Mutability::Immutable),
        mutableLeaves_(mutability == Mutability::MutableContainersAndLeaves) {}

  Ref<Object> document() {
    if (!skip()) return nullptr;
    if (atEnd()) return dictionary(Pairs());  // an empty strings table
    size_t start = pos_;
    auto first = value(1);
    if (!first || !skip()) return nullptr;
    if (atEnd()) return first;
    if (first->kind() != TypeKind::String || (peek() != '=' && peek() != ';')) return nullptr;
    // A strings table: the first string was its first key.
    pos_ = start;
    Pairs pairs;
    if (!entries(pairs, 1, /*table=*/true)) return nullptr;
    return dictionary(std::move(pairs));
  }

 private:
  bool atEnd() const { return pos_ >= text_.size(); }
  int peek(size_t ahead = 0) const {
    return pos_ + ahead < text_.size() ? text_[pos_ + ahead] : kEnd;
  }

  // Skips white space and comments; false for a comment left open.
  bool skip() {
    while (!atEnd()) {
      int c = peek();
      if (isSpace(c)) {
        ++pos_;
      } else if (c == '/' && peek(1) == '/') {
        pos_ += 2;
        while (!atEnd() && !isLineEnd(peek())) ++pos_;
      } else if (c == '/' && peek(1) == '*') {
        size_t close = text_.find(u"*/", pos_ + 2);
        if (close == std::u16string_view::npos) return false;
        pos_ = close + 2;
      } else {
        break;
      }
    }
    return true;
  }

  Ref<Object> value(size_t depth) {
    if (depth > kMaxPropertyListDepth) return nullptr;
    switch (peek()) {
      case '{': {
        ++pos_;
        Pairs pairs;
        if (!entries(pairs, depth, /*table=*/false)) return nullptr;
        return dictionary(std::move(pairs));
      }
      case '(':
        ++pos_;
        return array(depth);
      case '<':
        ++pos_;
        return data();
      default: {
        auto s = string();
        if (!s || !mutableLeaves_) return s;
        return s->mutableCopy();
      }
    }
  }

  // A quoted or unquoted string, always immutable (dictionary keys stay so).
  Ref<String> string() {
    int c = peek();
    if (c == '"' || c == '\'') return quoted(static_cast<char16_t>(c));
    size_t start = pos_;
    while (isUnquotedChar(peek())) ++pos_;
    if (pos_ == start) return nullptr;
    return String::fromUTF16(text_.substr(start, pos_ - start));
  }

  Ref<String> quoted(char16_t quote) {
    ++pos_;
    buffer_.clear();
    for (;;) {
      if (atEnd()) return nullptr;
      char16_t c = text_[pos_++];
      if (c == quote) return String::fromUTF16(buffer_);
      if (c != '\\') {
        buffer_.push_back(c);
        continue;
      }
      if (atEnd()) return nullptr;
      c = text_[pos_++];
      switch (c) {
        case 'a':
          buffer_.push_back(u'\a');
          break;
        case 'b':
          buffer_.push_back(u'\b');
          break;
        case 'f':
          buffer_.push_back(u'\f');
          break;
        case 'n':
          buffer_.push_back(u'\n');
          break;
        case 'r':
          buffer_.push_back(u'\r');
          break;
        case 't':
          buffer_.push_back(u'\t');
          break;
        case 'v':
          buffer_.push_back(u'\v');
          break;
        case 'U': {
          // Up to four hex digits name one UTF-16 code unit.
          int unit = 0, digits = 0;
          while (digits < 4 && hexValue(peek()) >= 0)
            unit = unit * 16 + hexValue(text_[pos_++]), ++digits;
          if (digits == 0) return nullptr;
          buffer_.push_back(static_cast<char16_t>(unit));
          break;
        }
        default:
          if (c >= '0' && c <= '7') {
            // Up to three octal digits name a byte, taken as U+0000..U+00FF.
            int byte = c - '0';
            for (int i = 1; i < 3 && peek() >= '0' && peek() <= '7'; ++i)
              byte = byte * 8 + (text_[pos_++] - '0');
            if (byte > 0xFF) return nullptr;
            buffer_.push_back(static_cast<char16_t>(byte));
          } else {
            buffer_.push_back(c);  // \" \\ \' and any other character stand for themselves
          }
      }
    }
  }

  Ref<Object> data() {
    std::vector<uint8_t> bytes;
    int high = -1;
    for (;;) {
      int c = peek();
      if (c == kEnd) return nullptr;
      ++pos_;
      if (c == '>') break;
      if (isSpace(c)) continue;
      int v = hexValue(c);
      if (v < 0) return nullptr;
      if (high < 0) {
        high = v;
      } else {
        bytes.push_back(static_cast<uint8_t>(high << 4 | v));
        high = -1;
      }
    }
    if (high >= 0) return nullptr;  // an odd number of digits
    if (mutableLeaves_) return make<MutableData>(std::move(bytes));
    return make<Data>(std::move(bytes));
  }

  // After "(": values separated by commas, a trailing comma allowed.
  Ref<Object> array(size_t depth) {
    std::vector<Ref<Object>> items;
    for (;;) {
      if (!skip()) return nullptr;
      if (peek() == ')') {
        ++pos_;
        break;
      }
      auto v = value(depth + 1);
      if (!v || !skip()) return nullptr;
      items.push_back(std::move(v));
      if (peek() == ',') {
        ++pos_;
      } else if (peek() == ')') {
        ++pos_;
        break;
      } else {
        return nullptr;
      }
    }
    if (mutableContainers_) return make<MutableArray>(std::move(items));
    return Array::build(std::move(items));
  }

  // key = value; entries up to "}" (or, for a strings table, to the end of
  // the text, where "key"; alone also stands for key = key).
  bool entries(Pairs& out, size_t depth, bool table) {
    for (;;) {
      if (!skip()) return false;
      if (table ? atEnd() : peek() == '}') {
        if (!table) ++pos_;
        return true;
      }
      auto key = string();
      if (!key || !skip()) return false;
      Ref<Object> v;
      if (peek() == '=') {
        ++pos_;
        if (!skip()) return false;
        v = value(depth + 1);
        if (!v || !skip()) return false;
      } else if (table && peek() == ';') {
        if (depth + 1 > kMaxPropertyListDepth) return false;
        v = mutableLeaves_ ? Ref<Object>(key->mutableCopy()) : Ref<Object>(key);
      } else {
        return false;
      }
      if (peek() != ';') return false;
      ++pos_;
      out.emplace_back(std::move(key), std::move(v));
    }
  }

  Ref<Object> dictionary(Pairs pairs) {
    if (!mutableContainers_) return Dictionary::build(std::move(pairs));
    return MutableDictionary::build(pairs);
  }

  std::u16string_view text_;
  size_t pos_ = 0;
  bool mutableContainers_;
  bool mutableLeaves_;
  std::u16string buffer_;
};

}  // namespace

Ref<Object> readTextPropertyList(std::string_view bytes, Mutability mutability) {
  std::u16string text;
  if (!decodePropertyListText(bytes, text)) return nullptr;
  return TextParser(text, mutability).document();
}

}  // namespace qr
