/* The value functions of <quarrin/plugin.h> as a plug-in written in C uses
 * them: who owns what, what NULL and handles of the wrong kind do, and the
 * conversions at the boundary; the values themselves are the C++ tests'.
 * Under the sanitizers a wrong reference count shows as a leak or a use
 * after free. */
#include <math.h>
#include <quarrin/plugin.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>

static int failures;
#define CHECK(c) \
  ((c) ? (void)0 : (void)(fprintf(stderr, "line %d: %s\n", __LINE__, #c), ++failures))
#define AT(array, i) QrArrayGetValueAtIndex(array, i)
#define END ((QrTypeRef)&failures) /* no value lives there */
#define RELEASE(...) \
  for (const QrTypeRef* p = (QrTypeRef[]){__VA_ARGS__, END}; *p != END; ++p) QrRelease(*p)
int main(void) {
  /* Containers keep their own references; a key is stored as it was when set. */
  QrMutableArrayRef a = QrArrayCreateMutable(), key = QrArrayCreateMutable();
  QrMutableDictionaryRef d = QrDictionaryCreateMutable();
  QrTypeRef s = QrStringCreateWithUTF8("Gr\xC3\xBC\xC3\x9F \xF0\x9F\x96\xA8");
  QrTypeRef n = QrNumberCreateInt64(7), empty = QrArrayCreateMutable();
  QrArrayAppendValue(a, s);
  QrDictionarySetValue(d, key, s);
  QrDictionarySetValue(d, s, n);
  QrArrayAppendValue(key, n);
  RELEASE(s, n);
  char* utf8 = QrStringCopyUTF8(AT(a, 0)); /* the caller's to free */
  CHECK(utf8 && strcmp(utf8, "Gr\xC3\xBC\xC3\x9F \xF0\x9F\x96\xA8") == 0);
  free(utf8);
  CHECK(QrStringGetLength(AT(a, 0)) == 7 && !AT(a, 1)); /* UTF-16 units */
  CHECK(QrDictionaryGetValue(d, empty) == AT(a, 0));
  QrTypeRef kept = QrRetain(QrDictionaryGetValue(d, AT(a, 0)));
  QrTypeRef handles[] = {NULL, a, d, kept}; /* each call gets every handle not of its kind */
  for (int i = 0; i < 4; ++i) {
    QrTypeRef h = handles[i];
    int64_t v = 5;
    QrArrayAppendValue((void*)(h == a ? NULL : h), kept);
    QrDictionarySetValue((void*)(h == d ? NULL : h), kept, kept);
    CHECK(QrStringGetLength(h) == 0 && QrStringCopyUTF8(h) == NULL && !QrDataGetBytes(h));
    CHECK(h == a || (QrArrayGetCount(h) == 0 && AT(h, 0) == NULL));
    CHECK(h == d || (QrDictionaryGetCount(h) == 0 && QrDictionaryGetValue(h, kept) == NULL));
    CHECK(h == kept || (!QrNumberGetInt64(h, &v) && v == 5 && QrUUIDGetBytes(h).bytes[15] == 0));
  }
  QrArrayAppendValue(a, NULL); /* NULL values and keys are not stored */
  QrDictionarySetValue(d, NULL, kept);
  QrDictionarySetValue(d, kept, NULL);
  CHECK(QrArrayGetCount(a) == 1 && QrDictionaryGetCount(d) == 2 && !QrDictionaryGetValue(d, NULL));
  CHECK(!QrRetain(NULL) && QrEqual(NULL, NULL) && !QrEqual(NULL, kept) && !QrGetKind(NULL));
  CHECK(!QrStringCreateWithUTF8(NULL) && !QrStringCreateWithUTF8("ab\xED\xA0\x80"));
  CHECK(!QrUUIDCreateFromString(NULL) && !QrDataCreate(NULL, 3) && !QrNumberGetInt64(kept, NULL));
  RELEASE(NULL, a, d, key, empty);
  CHECK(QrGetKind(kept) == QR_KIND_NUMBER); /* retained out of the dictionary, it outlives it */
  QrRelease(kept);

  /* Reals are truncated toward zero and reported exact only when they fit. */
  const double reals[] = {-3.0, 2.5, -0x1p63, 0x1p63, 1e300, NAN};
  const int64_t stored[] = {-3, 2, INT64_MIN, INT64_MAX, INT64_MAX, 0};
  for (int i = 0; i < 6; ++i) {
    QrNumberRef real = QrNumberCreateDouble(reals[i]);
    int64_t v = 7;
    CHECK(QrNumberGetInt64(real, &v) == (i == 0 || i == 2) && v == stored[i]);
    QrRelease(real);
  }
  uint8_t bytes[2] = {0, 0xFF};
  QrDataRef data = QrDataCreate(bytes, 2), none = QrDataCreate(NULL, 0);
  bytes[0] = 9; /* the data holds its own copy; empty data still gives a pointer */
  CHECK(QrDataGetBytes(data)[0] == 0 && QrDataGetLength(data) == 2 && QrDataGetBytes(none));
  RELEASE(data, none);

  return failures ? 1 : 0;
}
