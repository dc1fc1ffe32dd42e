/* The example of a broken plug-in: a printer module that crashes the moment it
 * is asked for its browser info. It is installed in the demo to show what a
 * run does with such a plug-in: the call runs in cachewright's helper process,
 * so only the helper dies; the run logs one line, keeps every other module's
 * answers, and remembers the crash, so that later runs skip this module until
 * it is rebuilt or its version changes. Do not copy this one. */
#define _GNU_SOURCE
#include <quarrin/plugin.h>
#include <signal.h>

#include "sample_support.h"

static int32_t CreateBrowserInfo(QrStringRef connectionType, QrArrayRef* browserInfo) {
  (void)connectionType;
  (void)browserInfo;
  raise(SIGSEGV); /* what a stray pointer would do, without undefined behaviour */
  return 0;
}

static const QrPrinterModuleVTbl kPrinterModuleTable = {NULL, NULL, NULL, CreateBrowserInfo};
static const struct {
  const QrPrinterModuleVTbl* table;
} kPrinterModuleInterface = {&kPrinterModuleTable};

static SampleInstance instance = {.interfaceID = QR_PM_INTERFACE_ID,
                                  .interface = (void*)&kPrinterModuleInterface};

__attribute__((constructor)) static void loaded(void) { sample_note_load(); }

SAMPLE_EXPORT void* BrokenPrinterModuleFactory(void* allocator, QrUUIDRef typeID) {
  (void)allocator;
  return sample_instance(&instance, typeID, QR_PM_TYPE_ID);
}
