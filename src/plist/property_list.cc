// Format detection and the file-level entry points.
#include "plist/property_list.h"

#include "platform/file_io.h"

namespace qr {
namespace {

bool isSpace(unsigned c) { return c == ' ' || c == '\t' || c == '\r' || c == '\n'; }

// The first few characters after any byte-order mark and leading white space,
// in ASCII ('?' for anything else), whether the text is UTF-8 or UTF-16.
std::string opening(std::string_view bytes) {
  std::string lead;
  bool little = bytes.starts_with("\xFF\xFE");
  bool utf16 = little || bytes.starts_with("\xFE\xFF");
  if (!utf16 && bytes.starts_with("\xEF\xBB\xBF")) bytes.remove_prefix(3);
  size_t step = utf16 ? 2 : 1;
  for (size_t i = utf16 ? 2 : 0; i + step <= bytes.size() && lead.size() < 6; i += step) {
    auto lo = static_cast<unsigned char>(bytes[i]);
    unsigned c = lo;
    if (utf16) {
      auto hi = static_cast<unsigned char>(bytes[i + 1]);
      c = little ? (lo | hi << 8) : (lo << 8 | hi);
    }
    if (lead.empty() && isSpace(c)) continue;
    lead += c < 0x80 ? static_cast<char>(c) : '?';
  }
  return lead;
}

PropertyListFormat detect(std::string_view bytes) {
  if (bytes.starts_with("bplist00")) return PropertyListFormat::Binary;
  // "<?xml", "<!DOCTYPE", "<!--" or "<plist"; a bare "<" may also open text-format data.
  std::string lead = opening(bytes);
  if (lead.starts_with("<?") || lead.starts_with("<!") || lead.starts_with("<plist"))
    return PropertyListFormat::XML;
  return PropertyListFormat::Text;
}

}  // namespace

Ref<Object> readPropertyList(std::string_view bytes, Mutability mutability,
                             PropertyListFormat* format) {
  PropertyListFormat f = detect(bytes);
  if (format) *format = f;
  // No bytes at all is no property list, though the text reader alone takes
  // an empty strings table.
  if (bytes.empty()) return nullptr;
  switch (f) {
    case PropertyListFormat::Binary:
      return readBinaryPropertyList(bytes, mutability);
    case PropertyListFormat::XML:
      return readXMLPropertyList(bytes, mutability);
    case PropertyListFormat::Text:
      break;
  }
  return readTextPropertyList(bytes, mutability);
}

Ref<Object> readPropertyListFile(const std::string& path, Mutability mutability) {
  auto bytes = readFile(path);
  if (!bytes) return nullptr;
  return readPropertyList(*bytes, mutability);
}

bool writePropertyListFile(const Object& value, const std::string& path) {
  auto xml = writeXMLPropertyList(value);
  if (!xml) return false;
  return writeFile(path, *xml);
}

}  // namespace qr
