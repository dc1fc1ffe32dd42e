#include "values/url.h"

#include <unistd.h>

#include <algorithm>
#include <cstring>
#include <vector>

#include "values/string.h"

namespace qr {
namespace {

bool isPathSafe(unsigned char c) {
  if ((c >= 'a' && c <= 'z') || (c >= 'A' && c <= 'Z') || (c >= '0' && c <= '9')) return true;
  return std::strchr("-._~!$&'()*+,=:@/", c) != nullptr && c != 0;
}

int hexValue(char c) {
  if (c >= '0' && c <= '9') return c - '0';
  if (c >= 'a' && c <= 'f') return c - 'a' + 10;
  if (c >= 'A' && c <= 'F') return c - 'A' + 10;
  return -1;
}

bool isValidURLText(std::string_view text) {
  for (size_t i = 0; i < text.size(); ++i) {
    unsigned char c = static_cast<unsigned char>(text[i]);
    if (c <= 0x20 || c >= 0x7F || std::strchr("\"<>\\^`{|}", c)) return false;
    if (c == '%' &&
        (i + 2 >= text.size() + 0 || hexValue(text[i + 1]) < 0 || hexValue(text[i + 2]) < 0))
      return false;
  }
  return true;
}

// Length of "scheme:" at the start, or 0 when the text has no scheme.
size_t schemeLength(std::string_view s) {
  if (s.empty() || !std::isalpha(static_cast<unsigned char>(s[0]))) return 0;
  for (size_t i = 1; i < s.size(); ++i) {
    char c = s[i];
    if (c == ':') return i + 1;
    if (!std::isalnum(static_cast<unsigned char>(c)) && c != '+' && c != '-' && c != '.') return 0;
  }
  return 0;
}

std::string removeDotSegments(std::string_view path) {
  std::vector<std::string_view> out;
  bool absolute = !path.empty() && path[0] == '/';
  size_t pos = absolute ? 1 : 0;
  bool trailingSlash = false;
  while (pos <= path.size()) {
    size_t end = path.find('/', pos);
    if (end == std::string_view::npos) end = path.size();
    std::string_view seg = path.substr(pos, end - pos);
    bool last = end == path.size();
    if (seg == ".") {
      trailingSlash = last;
    } else if (seg == "..") {
      if (!out.empty()) out.pop_back();
      trailingSlash = last;
    } else {
      out.push_back(seg);
      trailingSlash = false;
    }
    pos = end + 1;
  }
  std::string result = absolute ? "/" : "";
  for (size_t i = 0; i < out.size(); ++i) {
    if (i) result += '/';
    result += out[i];
  }
  if (trailingSlash && (result.empty() || result.back() != '/')) result += '/';
  return result;
}

// Splits "scheme://authority/path" into its scheme-and-authority prefix and path.
void splitAuthority(std::string_view abs, std::string_view& prefix, std::string_view& path) {
  size_t scheme = schemeLength(abs);
  size_t start = scheme;
  if (abs.substr(scheme, 2) == "//") {
    size_t slash = abs.find('/', scheme + 2);
    start = slash == std::string_view::npos ? abs.size() : slash;
  }
  prefix = abs.substr(0, start);
  path = abs.substr(start);
}

std::string resolve(std::string_view rel, const URL* base) {
  if (!base || schemeLength(rel) > 0) return std::string(rel);
  std::string_view baseAbs = base->absoluteString();
  std::string_view prefix, basePath;
  splitAuthority(baseAbs, prefix, basePath);
  if (rel.substr(0, 2) == "//")
    return std::string(baseAbs.substr(0, schemeLength(baseAbs))) + std::string(rel);
  if (rel.empty()) return std::string(baseAbs);
  if (rel[0] == '/') return std::string(prefix) + removeDotSegments(rel);
  std::string merged(basePath.substr(0, basePath.rfind('/') + 1));
  if (merged.empty()) merged.push_back('/');
  merged += rel;
  return std::string(prefix) + removeDotSegments(merged);
}

std::string currentDirectory() {
  std::vector<char> buf(4096);
  while (!getcwd(buf.data(), buf.size())) {
    if (errno != ERANGE) return "/";
    buf.resize(buf.size() * 2);
  }
  return buf.data();
}

}  // namespace

std::string percentEscapePath(std::string_view bytes) {
  static const char hex[] = "0123456789ABCDEF";
  std::string out;
  out.reserve(bytes.size());
  for (unsigned char c : bytes) {
    if (isPathSafe(c)) {
      out += static_cast<char>(c);
    } else {
      out += '%';
      out += hex[c >> 4];
      out += hex[c & 15];
    }
  }
  return out;
}

std::optional<std::string> percentDecode(std::string_view text) {
  std::string out;
  out.reserve(text.size());
  for (size_t i = 0; i < text.size();) {
    size_t escape = std::min(text.find('%', i), text.size());
    out.append(text, i, escape - i);
    if (escape == text.size()) break;
    if (escape + 2 >= text.size() || hexValue(text[escape + 1]) < 0 ||
        hexValue(text[escape + 2]) < 0)
      return std::nullopt;
    out += static_cast<char>(hexValue(text[escape + 1]) << 4 | hexValue(text[escape + 2]));
    i = escape + 3;
  }
  return out;
}

URL::URL(std::string relative, Ref<URL> base)
    : relative_(std::move(relative)), base_(std::move(base)) {
  absolute_ = resolve(relative_, base_.get());
}

Ref<URL> URL::withString(std::string_view text, const Ref<URL>& base) {
  if (!isValidURLText(text)) return nullptr;
  if (!base && schemeLength(text) == 0) return nullptr;
  return Ref<URL>::adopt(new URL(std::string(text), schemeLength(text) ? nullptr : base));
}

Ref<URL> URL::fileURL(std::string_view path, bool isDirectory) {
  if (!path.empty() && path[0] == '/') return fileURL(path, isDirectory, nullptr);
  std::string cwd = currentDirectory();
  auto base = fileURL(cwd, true, nullptr);
  return fileURL(path, isDirectory, base);
}

Ref<URL> URL::fileURL(std::string_view path, bool isDirectory, const Ref<URL>& base) {
  std::string escaped = percentEscapePath(path);
  if (isDirectory && (escaped.empty() || escaped.back() != '/')) escaped += '/';
  if (!path.empty() && path[0] == '/')
    return Ref<URL>::adopt(new URL("file://" + escaped, nullptr));
  if (!base) return fileURL(path, isDirectory);
  return Ref<URL>::adopt(new URL(escaped, base));
}

Ref<URL> URL::absoluteURL() const {
  // Without a base a URL is its own absolute form, and URLs never change.
  if (!base_) return Ref<URL>(const_cast<URL*>(this));
  return Ref<URL>::adopt(new URL(absolute_, nullptr));
}

bool URL::hasDirectoryPath() const noexcept {
  std::string_view prefix, path;
  splitAuthority(absolute_, prefix, path);
  return !path.empty() && path.back() == '/';
}

bool URL::isFileURL() const noexcept {
  size_t n = schemeLength(absolute_);
  return n == 5 && strncasecmp(absolute_.c_str(), "file:", 5) == 0;
}

std::optional<std::string> URL::fileSystemPath() const {
  if (!isFileURL()) return std::nullopt;
  std::string_view rest = std::string_view(absolute_).substr(5);
  if (rest.substr(0, 2) == "//") {
    size_t slash = rest.find('/', 2);
    std::string_view authority =
        rest.substr(2, slash == std::string_view::npos ? slash : slash - 2);
    if (!authority.empty() && authority != "localhost") return std::nullopt;
    rest = slash == std::string_view::npos ? std::string_view() : rest.substr(slash);
  }
  auto path = percentDecode(rest);
  if (!path || path->empty() || path->find('\0') != std::string::npos) return std::nullopt;
  while (path->size() > 1 && path->back() == '/') path->pop_back();
  return path;
}

bool URL::isEqual(const Object& other) const noexcept {
  if (this == &other) return true;
  if (other.kind() != TypeKind::URL) return false;
  const auto& o = static_cast<const URL&>(other);
  return relative_ == o.relative_ && equal(base_, o.base_);
}

size_t URL::hash() const noexcept {
  // Registries key modules by URL and look each up several times a run.
  size_t h = hash_.load(std::memory_order_relaxed);
  if (h == 0) {
    h = hashCodeUnits(std::string_view(relative_));
    hash_.store(h, std::memory_order_relaxed);
  }
  return h;
}

}  // namespace qr
