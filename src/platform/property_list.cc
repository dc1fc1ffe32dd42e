// Format detection and the file-level entry points.
#include "platform/property_list.h"

#include "platform/file_io.h"

namespace qr {
namespace {

PropertyListFormat detect(std::string_view bytes) {
  if (bytes.substr(0, 8) == "bplist00") return PropertyListFormat::Binary;
  std::string_view s = bytes;
  if (s.substr(0, 3) == "\xEF\xBB\xBF") s.remove_prefix(3);
  while (!s.empty() && (s[0] == ' ' || s[0] == '\t' || s[0] == '\r' || s[0] == '\n'))
    s.remove_prefix(1);
  // "<?xml", "<!DOCTYPE", "<!--" or "<plist"; a bare "<" may also open text-format data.
  if (s.size() >= 2 && s[0] == '<' && (s[1] == '?' || s[1] == '!' || s.substr(1, 5) == "plist"))
    return PropertyListFormat::XML;
  return PropertyListFormat::Text;
}

}  // namespace

Ref<Object> readPropertyList(std::string_view bytes, Mutability mutability,
                             PropertyListFormat* format) {
  PropertyListFormat f = detect(bytes);
  if (format) *format = f;
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
