/* The value functions used the way a C plug-in uses them. Run under the
 * sanitizers, a wrong reference count shows up as a leak or a use after free.
 * What the values themselves do is proven by the C++ tests; these prove the
 * handles, the references and the checks at the boundary. */
#include "check.h"

static void strings_round_trip_utf8(void) {
  const char* text = "Gr\xC3\xBC\xC3\x9F \xF0\x9F\x96\xA8"; /* "Grüß " + printer emoji */
  QrStringRef s = QrStringCreateWithUTF8(text);
  QrStringRef same = QrStringCreateWithUTF8(text);
  QrStringRef empty = QrStringCreateWithUTF8("");
  CHECK(QrGetKind(s) == QR_KIND_STRING);
  CHECK(QrStringGetLength(s) == 7); /* UTF-16 units: the emoji takes two */
  CHECK(utf8_is(s, text));
  CHECK(QrStringGetLength(empty) == 0 && utf8_is(empty, ""));
  CHECK(QrStringCreateWithUTF8("ab\xED\xA0\x80") == NULL); /* encoded surrogate */
  CHECK(QrEqual(s, same) && same != s);
  CHECK(!QrEqual(s, empty));
  release_all(s, same, empty, NULL);
}

static void arrays_keep_their_own_references(void) {
  QrMutableArrayRef a = QrArrayCreateMutable();
  QrStringRef usb = QrStringCreateWithUTF8("USB");
  QrNumberRef n = QrNumberCreateInt64(7);
  QrArrayAppendValue(a, usb);
  QrArrayAppendValue(a, n);
  QrArrayAppendValue(a, usb);
  release_all(usb, n, NULL); /* the array still holds them */
  CHECK(QrArrayGetCount(a) == 3);
  CHECK(utf8_is(QrArrayGetValueAtIndex(a, 2), "USB"));
  CHECK(QrGetKind(QrArrayGetValueAtIndex(a, 1)) == QR_KIND_NUMBER);
  CHECK(QrArrayGetValueAtIndex(a, 3) == NULL);
  CHECK(QrArrayGetValueAtIndex(a, (size_t)-1) == NULL);

  /* A value retained out of the array outlives the array. */
  QrTypeRef kept = QrRetain(QrArrayGetValueAtIndex(a, 0));
  QrRelease(a);
  CHECK(QrStringGetLength(kept) == 3);
  QrRelease(kept);
}

static void dictionaries_set_replace_and_look_up_by_value(void) {
  QrMutableDictionaryRef d = QrDictionaryCreateMutable();
  QrStringRef key = QrStringCreateWithUTF8("connectionType");
  QrStringRef usb = QrStringCreateWithUTF8("USB");
  QrStringRef dnssd = QrStringCreateWithUTF8("DNSSD");
  QrDictionarySetValue(d, key, usb);
  QrDictionarySetValue(d, key, dnssd); /* replaces */
  CHECK(QrDictionaryGetCount(d) == 1);

  QrStringRef lookup = QrStringCreateWithUTF8("connectionType"); /* equal, not the same */
  CHECK(QrEqual(QrDictionaryGetValue(d, lookup), dnssd));
  QrStringRef other = QrStringCreateWithUTF8("other");
  CHECK(QrDictionaryGetValue(d, other) == NULL);

  QrNumberRef numberKey = QrNumberCreateInt64(1);
  QrDictionarySetValue(d, numberKey, usb);
  QrNumberRef realKey = QrNumberCreateDouble(1.0); /* equal by value */
  CHECK(QrDictionaryGetValue(d, realKey) == usb);

  /* NULL keys and values change nothing. */
  QrDictionarySetValue(d, NULL, usb);
  QrDictionarySetValue(d, other, NULL);
  CHECK(QrDictionaryGetCount(d) == 2);

  /* A mutable array used as key is stored as it was: later appends do not
   * move the entry out of reach. */
  QrMutableArrayRef arrayKey = QrArrayCreateMutable();
  QrDictionarySetValue(d, arrayKey, other);
  QrArrayAppendValue(arrayKey, usb);
  QrMutableArrayRef emptyArray = QrArrayCreateMutable();
  CHECK(QrDictionaryGetValue(d, emptyArray) == other);

  release_all(emptyArray, arrayKey, realKey, numberKey, other, lookup, dnssd, usb, key, NULL);
  /* The dictionary kept its own references to everything. */
  CHECK(QrDictionaryGetCount(d) == 3);
  QrRelease(d);
}

static void numbers_report_whether_the_integer_is_exact(void) {
  int64_t v = 0;
  QrNumberRef big = QrNumberCreateInt64(INT64_MIN);
  QrNumberRef whole = QrNumberCreateDouble(-3.0);
  QrNumberRef half = QrNumberCreateDouble(2.5);
  QrNumberRef huge = QrNumberCreateDouble(1e300);
  QrNumberRef nan = QrNumberCreateDouble(0.0 / 0.0);
  CHECK(QrNumberGetInt64(big, &v) && v == INT64_MIN);
  CHECK(QrNumberGetInt64(whole, &v) && v == -3);
  CHECK(!QrNumberGetInt64(half, &v) && v == 2);
  CHECK(!QrNumberGetInt64(huge, &v));
  CHECK(!QrNumberGetInt64(nan, &v));
  CHECK(!QrNumberGetInt64(big, NULL));
  CHECK(QrEqual(whole, whole) && !QrEqual(whole, half));
  release_all(nan, huge, half, whole, big, NULL);
}

static void booleans_and_data(void) {
  QrBooleanRef t = QrBooleanGetTrue(), f = QrBooleanGetFalse();
  CHECK(t && f && t != f && !QrEqual(t, f));
  CHECK(t == QrBooleanGetTrue() && QrGetKind(t) == QR_KIND_BOOLEAN);

  uint8_t bytes[4] = {0, 1, 0xFE, 0xFF};
  QrDataRef d = QrDataCreate(bytes, sizeof bytes);
  bytes[0] = 9; /* the data holds its own copy */
  CHECK(QrDataGetLength(d) == 4 && QrGetKind(d) == QR_KIND_DATA);
  CHECK(QrDataGetBytes(d)[0] == 0 && QrDataGetBytes(d)[3] == 0xFF);
  QrDataRef empty = QrDataCreate(NULL, 0);
  CHECK(empty && QrDataGetLength(empty) == 0 && QrDataGetBytes(empty) != NULL);
  CHECK(QrDataCreate(NULL, 3) == NULL);
  release_all(empty, d, NULL);
}

static void uuid_bytes_follow_the_text(void) {
  QrUUIDRef u = QrUUIDCreateFromString("00112233-4455-6677-8899-AABBCCDDEEFF");
  QrUUIDBytes b = QrUUIDGetBytes(u);
  for (int i = 0; i < 16; ++i) CHECK(b.bytes[i] == (uint8_t)(i * 0x11));
  QrUUIDRef lower = QrUUIDCreateFromString("00112233-4455-6677-8899-aabbccddeeff");
  QrUUIDRef again = QrUUIDCreateFromBytes(b);
  CHECK(QrEqual(u, lower) && QrEqual(u, again) && QrGetKind(u) == QR_KIND_UUID);
  CHECK(QrUUIDCreateFromString("00112233-4455-6677-8899-AABBCCDDEEF") == NULL);
  release_all(again, lower, u, NULL);

  const char* ids[] = {QR_PM_TYPE_ID,  QR_PM_INTERFACE_ID, QR_IOM_TYPE_ID,     QR_IOM_INTERFACE_ID,
                       QR_PBM_TYPE_ID, QR_PBM_VERSION_ID,  QR_PBM_INTERFACE_ID};
  for (size_t i = 0; i < sizeof ids / sizeof ids[0]; ++i) {
    QrUUIDRef id = QrUUIDCreateFromString(ids[i]);
    CHECK(id != NULL);
    if (i == 0) CHECK(QrUUIDGetBytes(id).bytes[0] == 0x5D && QrUUIDGetBytes(id).bytes[15] == 0xC1);
    QrRelease(id);
  }
}

static void null_and_wrong_kinds_are_harmless(void) {
  CHECK(QrRetain(NULL) == NULL);
  QrRelease(NULL);
  CHECK(QrEqual(NULL, NULL));
  CHECK(QrGetKind(NULL) == QR_KIND_NONE);
  CHECK(QrStringCreateWithUTF8(NULL) == NULL);
  CHECK(QrStringCopyUTF8(NULL) == NULL && QrStringGetLength(NULL) == 0);
  QrArrayAppendValue(NULL, NULL);
  CHECK(QrArrayGetCount(NULL) == 0 && QrArrayGetValueAtIndex(NULL, 0) == NULL);
  QrDictionarySetValue(NULL, NULL, NULL);
  CHECK(QrDictionaryGetValue(NULL, NULL) == NULL && QrDictionaryGetCount(NULL) == 0);
  CHECK(!QrNumberGetInt64(NULL, NULL));
  CHECK(QrDataGetBytes(NULL) == NULL && QrDataGetLength(NULL) == 0);
  CHECK(QrPropertyListCreateFromFile(NULL) == NULL);
  CHECK(QrUUIDCreateFromString(NULL) == NULL);
  QrUUIDBytes zero = QrUUIDGetBytes(NULL);
  for (int i = 0; i < 16; ++i) CHECK(zero.bytes[i] == 0);

  /* Handles of another kind: nothing happens. */
  QrStringRef s = QrStringCreateWithUTF8("text");
  QrMutableDictionaryRef d = QrDictionaryCreateMutable();
  QrMutableArrayRef a = QrArrayCreateMutable();
  QrArrayAppendValue((QrMutableArrayRef)(void*)d, s);
  QrArrayAppendValue(a, NULL);
  QrDictionarySetValue((QrMutableDictionaryRef)(void*)a, s, s);
  CHECK(QrArrayGetCount(a) == 0 && QrDictionaryGetCount(d) == 0);
  CHECK(QrArrayGetCount((QrArrayRef)(const void*)s) == 0);
  CHECK(QrStringGetLength((QrStringRef)(const void*)a) == 0);
  CHECK(QrStringCopyUTF8((QrStringRef)(const void*)d) == NULL);
  CHECK(QrDataGetLength((QrDataRef)(const void*)s) == 0);
  int64_t v = 5;
  CHECK(!QrNumberGetInt64((QrNumberRef)(const void*)s, &v) && v == 5);
  CHECK(QrUUIDGetBytes((QrUUIDRef)(const void*)s).bytes[0] == 0);
  release_all(a, d, s, NULL);
}

int main(void) {
  strings_round_trip_utf8();
  arrays_keep_their_own_references();
  dictionaries_set_replace_and_look_up_by_value();
  numbers_report_whether_the_integer_is_exact();
  booleans_and_data();
  uuid_bytes_follow_the_text();
  null_and_wrong_kinds_are_harmless();
  return CHECK_DONE();
}
