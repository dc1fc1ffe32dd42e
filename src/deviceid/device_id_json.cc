#include "deviceid/device_id_json.h"

#include <charconv>
#include <cmath>

#include "deviceid/dictionary_additions.h"
#include "deviceid/string_additions.h"
#include "values/array.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/date.h"
#include "values/deep_copy.h"
#include "values/number.h"

namespace qr::deviceid {
namespace {

void appendEscaped(std::string& out, std::string_view utf8) {
  static constexpr char kHex[] = "0123456789abcdef";
  out += '"';
  for (char c : utf8) {
    auto byte = static_cast<unsigned char>(c);
    switch (c) {
      case '"':
        out += "\\\"";
        break;
      case '\\':
        out += "\\\\";
        break;
      case '\n':
        out += "\\n";
        break;
      case '\r':
        out += "\\r";
        break;
      case '\t':
        out += "\\t";
        break;
      case '\b':
        out += "\\b";
        break;
      case '\f':
        out += "\\f";
        break;
      default:
        if (byte < 0x20) {
          out += "\\u00";
          out += kHex[byte >> 4];
          out += kHex[byte & 15];
        } else {
          out += c;
        }
    }
  }
  out += '"';
}

void appendBase64(std::string& out, std::string_view bytes) {
  static constexpr char kAlphabet[] =
      "ABCDEFGHIJKLMNOPQRSTUVWXYZabcdefghijklmnopqrstuvwxyz0123456789+/";
  out += '"';
  size_t i = 0;
  for (; i + 3 <= bytes.size(); i += 3) {
    uint32_t n = (uint32_t(uint8_t(bytes[i])) << 16) | (uint32_t(uint8_t(bytes[i + 1])) << 8) |
                 uint8_t(bytes[i + 2]);
    out += kAlphabet[n >> 18];
    out += kAlphabet[(n >> 12) & 63];
    out += kAlphabet[(n >> 6) & 63];
    out += kAlphabet[n & 63];
  }
  if (size_t rest = bytes.size() - i) {
    uint32_t n = uint32_t(uint8_t(bytes[i])) << 16;
    if (rest == 2) n |= uint32_t(uint8_t(bytes[i + 1])) << 8;
    out += kAlphabet[n >> 18];
    out += kAlphabet[(n >> 12) & 63];
    out += rest == 2 ? kAlphabet[(n >> 6) & 63] : '=';
    out += '=';
  }
  out += '"';
}

void appendNumber(std::string& out, const Number& n) {
  if (!n.isReal()) {
    out += n.description();
    return;
  }
  double d = n.doubleValue();
  if (!std::isfinite(d)) {
    // JSON has no infinities or NaN; keep the value readable as a string.
    appendEscaped(out, n.description());
    return;
  }
  char buf[64];
  auto [end, ec] = std::to_chars(buf, buf + sizeof buf, d);
  out.append(buf, ec == std::errc() ? end : buf);
}

void appendValue(std::string& out, const Object* value, size_t depth) {
  if (!value || depth > kMaxPropertyListDepth) {
    out += "null";
    return;
  }
  switch (value->kind()) {
    case TypeKind::String:
      appendJSONString(out, static_cast<const String&>(*value));
      return;
    case TypeKind::Number:
      appendNumber(out, static_cast<const Number&>(*value));
      return;
    case TypeKind::Boolean:
      out += static_cast<const Boolean&>(*value).value() ? "true" : "false";
      return;
    case TypeKind::Data:
      appendBase64(out, static_cast<const Data&>(*value).view());
      return;
    case TypeKind::Array: {
      out += '[';
      bool first = true;
      for (const auto& item : static_cast<const Array&>(*value)) {
        if (!first) out += ',';
        first = false;
        appendValue(out, item.get(), depth + 1);
      }
      out += ']';
      return;
    }
    case TypeKind::Dictionary: {
      out += '{';
      bool first = true;
      static_cast<const Dictionary&>(*value).forEach([&](const Object& k, const Object& v) {
        if (!first) out += ',';
        first = false;
        if (k.kind() == TypeKind::String)
          appendJSONString(out, static_cast<const String&>(k));
        else
          appendEscaped(out, k.description());
        out += ':';
        appendValue(out, &v, depth + 1);
      });
      out += '}';
      return;
    }
    default:
      // Dates print as ISO 8601, the rest as their description.
      appendEscaped(out, value->description());
      return;
  }
}

// Writes "key": with the comma that separates it from the previous member.
void appendKey(std::string& out, std::string_view key) {
  out += out.size() > 1 ? ",\"" : "\"";
  out += key;
  out += "\":";
}

void appendBool(std::string& out, bool value) { out += value ? "true" : "false"; }

}  // namespace

void appendJSONString(std::string& out, const String& text) {
  if (text.isNarrow())
    appendEscaped(out, text.narrow());
  else
    appendEscaped(out, text.utf8());
}

void appendJSONValue(std::string& out, const Object* value) { appendValue(out, value, 0); }

std::string deviceIDRecord(const String& id) {
  namespace S = PMStringAdditions;
  std::string out = "{";
  appendKey(out, "input");
  appendJSONString(out, id);
  appendKey(out, "make");
  appendJSONValue(out, S::make(id).get());
  appendKey(out, "model");
  appendJSONValue(out, S::model(id).get());
  appendKey(out, "commandSet");
  appendJSONValue(out, S::commandSet(id).get());
  appendKey(out, "compatibleIDs");
  appendJSONValue(out, S::compatibleIDs(id).get());
  appendKey(out, "serialNumber");
  appendJSONValue(out, S::serialNumber(id).get());
  appendKey(out, "product");
  appendJSONValue(out, S::product(id).get());
  appendKey(out, "deviceName");
  appendJSONValue(out, S::deviceName(id).get());
  appendKey(out, "softwareUpdateScaneID");
  appendJSONValue(out, S::softwareUpdateScaneID(id).get());
  appendKey(out, "supportsPCL");
  appendBool(out, S::supportsPCL(id));
  appendKey(out, "supportsPostscript");
  appendBool(out, S::supportsPostscript(id));
  appendKey(out, "dictionaryValue");
  appendJSONValue(out, S::dictionaryValue(id).get());
  out += '}';
  return out;
}

std::string deviceDictionaryRecord(const Dictionary& device) {
  namespace D = PMDictionaryAdditions;
  std::string out = "{";
  appendKey(out, "make");
  appendJSONValue(out, D::make(device).get());
  appendKey(out, "model");
  appendJSONValue(out, D::model(device).get());
  appendKey(out, "commandSet");
  appendJSONValue(out, D::commandSet(device).get());
  appendKey(out, "compatibleIDs");
  appendJSONValue(out, D::compatibleIDs(device).get());
  appendKey(out, "serialNumber");
  appendJSONValue(out, D::serialNumber(device).get());
  appendKey(out, "product");
  appendJSONValue(out, D::product(device).get());
  appendKey(out, "softwareUpdateScaneID");
  appendJSONValue(out, D::softwareUpdateScaneID(device).get());
  appendKey(out, "supportsPCL");
  appendBool(out, D::supportsPCL(device));
  appendKey(out, "supportsPostscript");
  appendBool(out, D::supportsPostscript(device));
  appendKey(out, "stringValue");
  appendJSONValue(out, D::stringValue(device).get());
  out += '}';
  return out;
}

}  // namespace qr::deviceid
