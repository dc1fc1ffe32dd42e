/* A sample I/O module. It serves one connection type and names the printer
 * browser module that finds printers on it, both fixed when it is built:
 *
 *   SAMPLE_CONNECTION_TYPE  e.g. "USB"
 *   SAMPLE_BROWSER_PATH     a path relative to this bundle, or an absolute one
 *
 * Its factory is SampleIOModuleFactory. */
#define _GNU_SOURCE
#include <quarrin/plugin.h>

#include "sample_support.h"

static int32_t GetConnectionInfo(QrStringRef* connectionType, QrStringRef* pbmPath) {
  /* Made once and kept: what GetConnectionInfo hands out stays the plug-in's. */
  static QrStringRef type, path;
  if (!type) type = QrStringCreateWithUTF8(SAMPLE_CONNECTION_TYPE);
  if (!path) path = QrStringCreateWithUTF8(SAMPLE_BROWSER_PATH);
  if (!type || !path) return -1;
  if (connectionType) *connectionType = type;
  if (pbmPath) *pbmPath = path;
  return 0;
}

static const QrIOModuleVTbl kIOModuleTable = {NULL, NULL, NULL, GetConnectionInfo};
static const struct { const QrIOModuleVTbl* table; } kIOModuleInterface = {&kIOModuleTable};

static SampleInstance instance = {.interfaceID = QR_IOM_INTERFACE_ID,
                                  .interface = (void*)&kIOModuleInterface};

__attribute__((constructor)) static void loaded(void) { sample_note_load(); }

SAMPLE_EXPORT void* SampleIOModuleFactory(void* allocator, QrUUIDRef typeID) {
  (void)allocator;
  return sample_instance(&instance, typeID, QR_IOM_TYPE_ID);
}
