/* An I/O module written the way an outside author writes one: plain C99,
 * nothing but <quarrin/plugin.h>, built with the flags pkg-config or the
 * CMake package gives. It answers the connection type "Installed". */
#include <quarrin/plugin.h>
#include <stdlib.h>
#include <string.h>

typedef struct {
  const QrIUnknownVTbl* table;
  uint32_t refs;
} Instance;

static int32_t GetConnectionInfo(QrStringRef* connectionType, QrStringRef* pbmPath) {
  static QrStringRef type;
  (void)pbmPath;
  if (!type) type = QrStringCreateWithUTF8("Installed");
  if (!connectionType) QrRaise("ExternalError", "no place for the connection type");
  *connectionType = type;
  return 0;
}

static const QrIOModuleVTbl kTable = {NULL, NULL, NULL, GetConnectionInfo};
static const struct { const QrIOModuleVTbl* table; } kInterface = {&kTable};

static bool is(QrUUIDBytes bytes, const char* text) {
  QrUUIDRef uuid = QrUUIDCreateFromString(text);
  QrUUIDBytes other = QrUUIDGetBytes(uuid);
  QrRelease(uuid);
  return memcmp(bytes.bytes, other.bytes, sizeof other.bytes) == 0;
}

static uint32_t AddRef(void* self) { return ++((Instance*)self)->refs; }

static uint32_t Release(void* self) {
  Instance* instance = self;
  uint32_t refs = --instance->refs;
  if (refs == 0) free(instance);
  return refs;
}

static int32_t QueryInterface(void* self, QrUUIDBytes iid, void** out) {
  (void)self;
  if (!is(iid, QR_IOM_INTERFACE_ID)) {
    *out = NULL;
    return QR_E_NOINTERFACE;
  }
  *out = (void*)&kInterface;
  return QR_S_OK;
}

static const QrIUnknownVTbl kInstanceTable = {NULL, QueryInterface, AddRef, Release};

void* CreateInstance(void* allocator, QrUUIDRef typeID) {
  QrUUIDRef iom = QrUUIDCreateFromString(QR_IOM_TYPE_ID);
  bool wanted = QrEqual(typeID, iom);
  Instance* instance = NULL;
  (void)allocator;
  QrRelease(iom);
  if (!wanted) return NULL;
  instance = malloc(sizeof *instance);
  if (!instance) return NULL;
  instance->table = &kInstanceTable;
  instance->refs = 1;
  return instance;
}
