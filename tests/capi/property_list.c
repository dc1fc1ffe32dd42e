/* Property lists read from files, as a plug-in reads its own resources. */
#define _GNU_SOURCE
#include <unistd.h>

#include "check.h"

static char* write_temp(const char* text) {
  char* path = strdup("/tmp/quarrin-capi-plist-XXXXXX");
  int fd = mkstemp(path);
  if (fd < 0) return path;
  size_t length = strlen(text);
  CHECK(write(fd, text, length) == (ssize_t)length);
  close(fd);
  return path;
}

static QrTypeRef value_for(QrTypeRef dictionary, const char* key) {
  QrStringRef k = QrStringCreateWithUTF8(key);
  QrTypeRef value = QrDictionaryGetValue(dictionary, k);
  QrRelease(k);
  return value;
}

static void reads_every_kind_of_value(void) {
  char* path = write_temp(
      "<?xml version=\"1.0\" encoding=\"UTF-8\"?>\n"
      "<plist version=\"1.0\">\n<dict>\n"
      "\t<key>USB</key>\n\t<array>\n"
      "\t\t<dict><key>Printer Browser Kind</key><string>Laser \xC3\xA9</string></dict>\n"
      "\t</array>\n"
      "\t<key>count</key><integer>-42</integer>\n"
      "\t<key>ratio</key><real>0.5</real>\n"
      "\t<key>on</key><true/>\n"
      "\t<key>icon</key><data>AAEC/w==</data>\n"
      "</dict>\n</plist>\n");
  QrTypeRef plist = QrPropertyListCreateFromFile(path);
  CHECK(QrGetKind(plist) == QR_KIND_DICTIONARY);
  CHECK(QrDictionaryGetCount(plist) == 5);

  QrTypeRef usb = value_for(plist, "USB");
  CHECK(QrGetKind(usb) == QR_KIND_ARRAY && QrArrayGetCount(usb) == 1);
  CHECK(
      utf8_is(value_for(QrArrayGetValueAtIndex(usb, 0), "Printer Browser Kind"), "Laser \xC3\xA9"));

  int64_t n = 0;
  CHECK(QrNumberGetInt64(value_for(plist, "count"), &n) && n == -42);
  CHECK(!QrNumberGetInt64(value_for(plist, "ratio"), &n) && n == 0);
  CHECK(value_for(plist, "on") == QrBooleanGetTrue());
  QrTypeRef icon = value_for(plist, "icon");
  CHECK(QrDataGetLength(icon) == 4 && QrDataGetBytes(icon)[3] == 0xFF);

  /* What was read is immutable: appending and setting change nothing. */
  QrArrayAppendValue((QrMutableArrayRef)(void*)usb, icon);
  CHECK(QrArrayGetCount(usb) == 1);
  QrDictionarySetValue((QrMutableDictionaryRef)(void*)plist, icon, icon);
  CHECK(QrDictionaryGetCount(plist) == 5);

  QrRelease(plist);
  unlink(path);
  free(path);
}

static void unreadable_files_give_null(void) {
  CHECK(QrPropertyListCreateFromFile("/nonexistent/quarrin/Info.plist") == NULL);
  char* path = write_temp("<plist version=\"1.0\"><dict><key>open</key>");
  CHECK(QrPropertyListCreateFromFile(path) == NULL);
  unlink(path);
  free(path);
}

int main(void) {
  reads_every_kind_of_value();
  unreadable_files_give_null();
  return CHECK_DONE();
}
