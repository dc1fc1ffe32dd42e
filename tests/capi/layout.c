/* The tables and the callbacks record as a plug-in compiled in C sees them:
 * entry N at N pointers, whatever the pointer size. */
#include <quarrin/plugin.h>
#include <stddef.h>

#include "check.h"

#define SLOT(n) ((n) * sizeof(void*))

int main(void) {
  CHECK(offsetof(QrIUnknownVTbl, QueryInterface) == SLOT(1));
  CHECK(offsetof(QrIUnknownVTbl, AddRef) == SLOT(2));
  CHECK(offsetof(QrIUnknownVTbl, Release) == SLOT(3));
  CHECK(offsetof(QrIOModuleVTbl, GetConnectionInfo) == SLOT(3));
  CHECK(offsetof(QrPrinterModuleVTbl, CreateBrowserInfo) == SLOT(3));
  CHECK(offsetof(QrBrowserModuleVTbl, GetSelectedPrinters) == SLOT(4));
  CHECK(offsetof(QrBrowserModuleVTbl, Initialize) == SLOT(5));
  CHECK(offsetof(QrBrowserModuleVTbl, Prologue) == SLOT(6));
  CHECK(offsetof(QrBrowserModuleVTbl, Sync) == SLOT(8));
  CHECK(offsetof(QrBrowserModuleVTbl, Terminate) == SLOT(9));
  CHECK(sizeof(QrBrowserModuleVTbl) == SLOT(10));
  /* The record: a version word, then three native function pointers. */
  CHECK(offsetof(PMPrBrowserCallbacks, version) == 0);
  CHECK(offsetof(PMPrBrowserCallbacks, getLookupSpec) == sizeof(void*));
  CHECK(offsetof(PMPrBrowserCallbacks, selStatus) == SLOT(3));
  CHECK(sizeof(QrUUIDBytes) == 16);
  CHECK(QR_E_NOINTERFACE < 0 && ((uint32_t)QR_E_NOINTERFACE) == 0x80000004u);
  return CHECK_DONE();
}
