/* An I/O module written the way an outside author writes one: plain C99,
 * nothing but <quarrin/plugin.h>, built with the flags pkg-config or the
 * CMake package gives. It answers the connection type "Installed"; built with
 * EXTERNAL_RAISES it raises instead, from C frames, through QrRaise. */
#include <quarrin/plugin.h>
#include <string.h>

static int32_t GetConnectionInfo(QrStringRef* connectionType, QrStringRef* pbmPath) {
  static QrStringRef type;
  (void)pbmPath;
#ifdef EXTERNAL_RAISES
  QrRaise("ExternalError", "raised from C");
#endif
  if (!connectionType) QrRaise("ExternalError", "no place for the connection type");
  if (!type) type = QrStringCreateWithUTF8("Installed");
  *connectionType = type;
  return 0;
}

static const QrIOModuleVTbl kTable = {NULL, NULL, NULL, GetConnectionInfo};
static const QrIOModuleVTbl* const kInterface = &kTable;

static int32_t QueryInterface(void* self, QrUUIDBytes iid, void** out) {
  QrUUIDRef iom = QrUUIDCreateFromString(QR_IOM_INTERFACE_ID);
  QrUUIDBytes bytes = QrUUIDGetBytes(iom);
  (void)self;
  QrRelease(iom);
  *out = memcmp(iid.bytes, bytes.bytes, sizeof bytes.bytes) ? NULL : (void*)&kInterface;
  return *out ? QR_S_OK : QR_E_NOINTERFACE;
}

/* The one instance is static, so counting references has nothing to free. */
static uint32_t Count(void* self) {
  (void)self;
  return 1;
}

static const QrIUnknownVTbl kUnknown = {NULL, QueryInterface, Count, Count};
static const QrIUnknownVTbl* const kInstance = &kUnknown;

__attribute__((visibility("default"))) void* CreateInstance(void* allocator, QrUUIDRef typeID) {
  QrUUIDRef iom = QrUUIDCreateFromString(QR_IOM_TYPE_ID);
  bool wanted = QrEqual(typeID, iom);
  (void)allocator;
  QrRelease(iom);
  return wanted ? (void*)&kInstance : NULL;
}
