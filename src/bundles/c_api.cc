// The value functions of <quarrin/plugin.h> over the qr:: value layer. Plug-in
// code may be plain C built without unwinding support, so nothing but QrRaise
// lets a C++ exception out: an allocation failure comes back as NULL.
#include <quarrin/plugin.h>

#include <cmath>
#include <cstddef>
#include <cstdlib>
#include <cstring>
#include <new>

#include "bundles/c_bridge.h"
#include "plist/property_list.h"
#include "values/array.h"
#include "values/boolean.h"
#include "values/data.h"
#include "values/dictionary.h"
#include "values/exception.h"
#include "values/number.h"
#include "values/string.h"
#include "values/uuid.h"

using namespace qr;

namespace {

// Entry N of every table sits N pointers in: hosts index the tables that way.
constexpr size_t kSlot = sizeof(void*);
static_assert(sizeof(QrUUIDBytes) == 16);
static_assert(offsetof(QrIUnknownVTbl, QueryInterface) == 1 * kSlot);
static_assert(offsetof(QrIUnknownVTbl, Release) == 3 * kSlot);
static_assert(offsetof(QrIOModuleVTbl, GetConnectionInfo) == 3 * kSlot);
static_assert(offsetof(QrPrinterModuleVTbl, CreateBrowserInfo) == 3 * kSlot);
static_assert(offsetof(QrBrowserModuleVTbl, GetSelectedPrinters) == 4 * kSlot);
static_assert(offsetof(QrBrowserModuleVTbl, Initialize) == 5 * kSlot);
static_assert(offsetof(QrBrowserModuleVTbl, Prologue) == 6 * kSlot);
static_assert(offsetof(QrBrowserModuleVTbl, Sync) == 8 * kSlot);
static_assert(offsetof(QrBrowserModuleVTbl, Terminate) == 9 * kSlot);
static_assert(sizeof(QrBrowserModuleVTbl) == 10 * kSlot);

template <class Handle, class F>
Handle created(F&& make) noexcept {
  try {
    return leakToC<Handle>(make());
  } catch (...) {
    return nullptr;
  }
}

// A key must not change once stored, or the dictionary loses track of it.
Ref<Object> stableKey(Object* key) {
  switch (key->kind()) {
    case TypeKind::String:
      return static_cast<String*>(key)->copy();
    case TypeKind::Array:
      return static_cast<Array*>(key)->copy();
    case TypeKind::Dictionary:
      return static_cast<Dictionary*>(key)->copy();
    default:
      return Ref<Object>(key);
  }
}

}  // namespace

extern "C" {

QrTypeRef QrRetain(QrTypeRef value) {
  if (Object* o = fromC(value)) o->retain();
  return value;
}

void QrRelease(QrTypeRef value) {
  if (Object* o = fromC(value)) o->release();
}

bool QrEqual(QrTypeRef a, QrTypeRef b) { return qr::equal(fromC(a), fromC(b)); }

QrValueKind QrGetKind(QrTypeRef value) {
  const Object* o = fromC(value);
  if (!o) return QR_KIND_NONE;
  switch (o->kind()) {
    case TypeKind::Other:
      return QR_KIND_OTHER;
    case TypeKind::String:
      return QR_KIND_STRING;
    case TypeKind::Number:
      return QR_KIND_NUMBER;
    case TypeKind::Boolean:
      return QR_KIND_BOOLEAN;
    case TypeKind::Data:
      return QR_KIND_DATA;
    case TypeKind::Date:
      return QR_KIND_DATE;
    case TypeKind::Array:
      return QR_KIND_ARRAY;
    case TypeKind::Dictionary:
      return QR_KIND_DICTIONARY;
    case TypeKind::URL:
      return QR_KIND_URL;
    case TypeKind::UUID:
      return QR_KIND_UUID;
  }
  return QR_KIND_OTHER;
}

QrStringRef QrStringCreateWithUTF8(const char* utf8) {
  if (!utf8) return nullptr;
  return created<QrStringRef>([&] { return String::fromUTF8(utf8); });
}

char* QrStringCopyUTF8(QrStringRef string) {
  const String* s = fromCAs<String>(string);
  if (!s) return nullptr;
  try {
    std::string text = s->utf8();
    char* out = static_cast<char*>(std::malloc(text.size() + 1));
    if (out) std::memcpy(out, text.c_str(), text.size() + 1);
    return out;
  } catch (...) {
    return nullptr;
  }
}

size_t QrStringGetLength(QrStringRef string) {
  const String* s = fromCAs<String>(string);
  return s ? s->length() : 0;
}

QrMutableArrayRef QrArrayCreateMutable(void) {
  return created<QrMutableArrayRef>([] { return make<MutableArray>(); });
}

void QrArrayAppendValue(QrMutableArrayRef array, QrTypeRef value) {
  MutableArray* a = fromCAs<MutableArray>(array);
  if (!a || !value) return;
  try {
    a->append(Ref<Object>(fromC(value)));
  } catch (...) {
  }
}

size_t QrArrayGetCount(QrArrayRef array) {
  const Array* a = fromCAs<Array>(array);
  return a ? a->count() : 0;
}

QrTypeRef QrArrayGetValueAtIndex(QrArrayRef array, size_t index) {
  const Array* a = fromCAs<Array>(array);
  return a ? toC(a->at(index)) : nullptr;
}

QrMutableDictionaryRef QrDictionaryCreateMutable(void) {
  return created<QrMutableDictionaryRef>([] { return make<MutableDictionary>(); });
}

void QrDictionarySetValue(QrMutableDictionaryRef dictionary, QrTypeRef key, QrTypeRef value) {
  MutableDictionary* d = fromCAs<MutableDictionary>(dictionary);
  if (!d || !key || !value) return;
  try {
    d->set(stableKey(fromC(key)), Ref<Object>(fromC(value)));
  } catch (...) {
  }
}

QrTypeRef QrDictionaryGetValue(QrDictionaryRef dictionary, QrTypeRef key) {
  const Dictionary* d = fromCAs<Dictionary>(dictionary);
  if (!d || !key) return nullptr;
  return toC(d->get(*fromC(key)));
}

size_t QrDictionaryGetCount(QrDictionaryRef dictionary) {
  const Dictionary* d = fromCAs<Dictionary>(dictionary);
  return d ? d->count() : 0;
}

QrNumberRef QrNumberCreateInt64(int64_t value) {
  return created<QrNumberRef>([&] { return Number::integer(value); });
}

QrNumberRef QrNumberCreateDouble(double value) {
  return created<QrNumberRef>([&] { return Number::real(value); });
}

bool QrNumberGetInt64(QrNumberRef number, int64_t* value) {
  const Number* n = fromCAs<Number>(number);
  if (!n || !value) return false;
  *value = n->int64Value();
  if (n->isReal()) {
    double d = n->doubleValue();
    return std::trunc(d) == d && d >= -9223372036854775808.0 && d < 9223372036854775808.0;
  }
  return !n->isUnsigned();
}

QrBooleanRef QrBooleanGetTrue(void) { return toC<QrBooleanRef>(Boolean::trueValue().get()); }

QrBooleanRef QrBooleanGetFalse(void) { return toC<QrBooleanRef>(Boolean::falseValue().get()); }

QrDataRef QrDataCreate(const uint8_t* bytes, size_t length) {
  if (!bytes && length) return nullptr;
  return created<QrDataRef>(
      [&] { return make<Data>(std::vector<uint8_t>(bytes, bytes + length)); });
}

const uint8_t* QrDataGetBytes(QrDataRef data) {
  const Data* d = fromCAs<Data>(data);
  if (!d) return nullptr;
  // Empty data still gives a pointer that memcpy may take.
  static const uint8_t kNoBytes[1] = {0};
  return d->length() ? d->bytes() : kNoBytes;
}

size_t QrDataGetLength(QrDataRef data) {
  const Data* d = fromCAs<Data>(data);
  return d ? d->length() : 0;
}

QrTypeRef QrPropertyListCreateFromFile(const char* path) {
  if (!path) return nullptr;
  return created<QrTypeRef>([&] { return readPropertyListFile(path); });
}

QrUUIDRef QrUUIDCreateFromString(const char* text) {
  if (!text) return nullptr;
  return created<QrUUIDRef>([&] { return UUID::fromString(text); });
}

QrUUIDRef QrUUIDCreateFromBytes(QrUUIDBytes bytes) {
  UUID::Bytes b;
  std::memcpy(b.data(), bytes.bytes, b.size());
  return created<QrUUIDRef>([&] { return make<UUID>(b); });
}

QrUUIDBytes QrUUIDGetBytes(QrUUIDRef uuid) {
  QrUUIDBytes out{};
  if (const UUID* u = fromCAs<UUID>(uuid)) std::memcpy(out.bytes, u->bytes().data(), 16);
  return out;
}

void QrRaise(const char* name, const char* reason) {
  throw Exception(name ? name : "", reason ? reason : "");
}

}  // extern "C"
