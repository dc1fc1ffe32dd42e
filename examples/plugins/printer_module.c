/* A sample printer module. What it recognises on each connection type is
 * kept in its bundle's Resources/BrowserInfo.plist, a dictionary of
 * connection type -> array of entries:
 *
 *   Printer Browser Kind, Printer Browser Info, Printer Browser DeviceID
 *       how a printer browser recognises the printer
 *   Printer Browser Icons Filename (optional)
 *       an image in Resources/PrinterIcons/; the answer then also carries
 *       "PM URL String", this bundle's URL, so that the icon can be found,
 *       and, when built with SAMPLE_EMBED_ICONS, the image itself under
 *       "Printer Browser Icons"
 *
 * Its factory is SamplePrinterModuleFactory. One shared object serves any
 * number of bundles: everything it answers comes from the bundle it sits in. */
#define _GNU_SOURCE
#include <quarrin/plugin.h>

#include "sample_support.h"

#ifndef SAMPLE_EMBED_ICONS
#define SAMPLE_EMBED_ICONS 0
#endif

static const char* const kCopiedKeys[] = {"Printer Browser Kind", "Printer Browser Info",
                                          "Printer Browser DeviceID",
                                          "Printer Browser Icons Filename"};

static QrStringRef string(const char* text) { return QrStringCreateWithUTF8(text); }

/* connection type -> entries, read once and kept for the life of the process. */
static QrDictionaryRef browser_info(void) {
  static QrTypeRef table;
  static bool read;
  if (!read) {
    read = true;
    char* path = sample_resource_path("BrowserInfo.plist");
    if (path) table = QrPropertyListCreateFromFile(path);
    free(path);
  }
  return QrGetKind(table) == QR_KIND_DICTIONARY ? (QrDictionaryRef)table : NULL;
}

/* "file://<bundle path>/", with the bytes a URL path cannot hold escaped. */
static QrStringRef bundle_url(void) {
  const char* path = sample_bundle_path();
  if (!path) return NULL;
  size_t size = sizeof "file://" + 3 * strlen(path) + 1;
  char* url = malloc(size);
  QrStringRef result = NULL;
  if (url) {
    char* out = url + sprintf(url, "file://");
    for (const unsigned char* p = (const unsigned char*)path; *p; ++p) {
      if ((*p >= 'a' && *p <= 'z') || (*p >= 'A' && *p <= 'Z') || (*p >= '0' && *p <= '9') ||
          strchr("/-._~", *p))
        *out++ = (char)*p;
      else
        out += sprintf(out, "%%%02X", *p);
    }
    strcpy(out, "/");
    result = string(url);
  }
  free(url);
  return result;
}

/* The bytes of Resources/PrinterIcons/<name>, or NULL. */
static QrDataRef icon_data(QrStringRef name) {
  char* file = QrStringCopyUTF8(name);
  if (!file || strchr(file, '/')) {
    free(file);
    return NULL;
  }
  char resource[512];
  snprintf(resource, sizeof resource, "PrinterIcons/%s", file);
  free(file);
  char* path = sample_resource_path(resource);
  FILE* f = path ? fopen(path, "rb") : NULL;
  free(path);
  if (!f) return NULL;
  uint8_t bytes[65536];
  size_t length = fread(bytes, 1, sizeof bytes, f);
  bool whole = feof(f) && !ferror(f);
  fclose(f);
  return whole ? QrDataCreate(bytes, length) : NULL;
}

/* The answer's copy of one entry of BrowserInfo.plist. */
static QrMutableDictionaryRef answer_entry(QrDictionaryRef entry, QrStringRef url) {
  QrMutableDictionaryRef answer = QrDictionaryCreateMutable();
  for (size_t i = 0; i < sizeof kCopiedKeys / sizeof kCopiedKeys[0]; ++i) {
    QrStringRef key = string(kCopiedKeys[i]);
    QrDictionarySetValue(answer, key, QrDictionaryGetValue(entry, key));
    QrRelease(key);
  }
  QrStringRef iconKey = string("Printer Browser Icons Filename");
  QrTypeRef iconName = QrDictionaryGetValue(entry, iconKey);
  QrRelease(iconKey);
  if (QrGetKind(iconName) == QR_KIND_STRING) {
    QrStringRef urlKey = string("PM URL String");
    QrDictionarySetValue(answer, urlKey, url);
    QrRelease(urlKey);
    if (SAMPLE_EMBED_ICONS) {
      QrDataRef icon = icon_data(iconName);
      QrStringRef dataKey = string("Printer Browser Icons");
      QrDictionarySetValue(answer, dataKey, icon);
      QrRelease(dataKey);
      QrRelease(icon);
    }
  }
  return answer;
}

static int32_t CreateBrowserInfo(QrStringRef connectionType, QrArrayRef* browserInfo) {
  if (!browserInfo) return -50;
  *browserInfo = NULL;
  QrTypeRef entries = QrDictionaryGetValue(browser_info(), connectionType);
  if (QrGetKind(entries) != QR_KIND_ARRAY) return 0; /* nothing on this connection */

  QrStringRef url = bundle_url();
  QrMutableArrayRef answer = QrArrayCreateMutable();
  for (size_t i = 0; i < QrArrayGetCount(entries); ++i) {
    QrTypeRef entry = QrArrayGetValueAtIndex(entries, i);
    if (QrGetKind(entry) != QR_KIND_DICTIONARY) continue;
    QrMutableDictionaryRef copy = answer_entry(entry, url);
    QrArrayAppendValue(answer, copy);
    QrRelease(copy);
  }
  QrRelease(url);
  *browserInfo = answer; /* the caller's to release */
  return 0;
}

static const QrPrinterModuleVTbl kPrinterModuleTable = {NULL, NULL, NULL, CreateBrowserInfo};
static const struct {
  const QrPrinterModuleVTbl* table;
} kPrinterModuleInterface = {&kPrinterModuleTable};

static SampleInstance instance = {.interfaceID = QR_PM_INTERFACE_ID,
                                  .interface = (void*)&kPrinterModuleInterface};

__attribute__((constructor)) static void loaded(void) { sample_note_load(); }

SAMPLE_EXPORT void* SamplePrinterModuleFactory(void* allocator, QrUUIDRef typeID) {
  (void)allocator;
  return sample_instance(&instance, typeID, QR_PM_TYPE_ID);
}
