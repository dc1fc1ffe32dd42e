/* A sample printer browser module. A real one shows, in its client's pane,
 * the printers it finds on its connection type; this one has no pane and
 * finds nothing, but it answers its title, takes the lookup dictionaries it is
 * given, and keeps its state as a browser would. Built with:
 *
 *   SAMPLE_TITLE  the title it gives in Prologue
 *
 * Its factory is SampleBrowserModuleFactory. */
#define _GNU_SOURCE
#include <quarrin/plugin.h>

#include "sample_support.h"

enum { kContext = 0x5A3D }; /* our own handle, passed back in every entry */

static uint32_t lookupSpecCount; /* what the client offered at Initialize */

static int32_t Prologue(uint32_t* context, uint32_t flags, QrStringRef* title, uint32_t* minH,
                        uint32_t* minV, uint32_t* maxH, uint32_t* maxV) {
  (void)flags;
  static QrStringRef kept; /* the title stays ours */
  if (!kept) kept = QrStringCreateWithUTF8(SAMPLE_TITLE);
  if (context) *context = kContext;
  if (title) *title = kept;
  if (minH) *minH = 320;
  if (minV) *minV = 200;
  if (maxH) *maxH = 1200;
  if (maxV) *maxV = 900;
  return 0;
}

static int32_t Initialize(uint32_t context, void* refCon, const PMPrBrowserCallbacks* callbacks,
                          void* userPane, uint32_t numLookupSpecs) {
  (void)userPane;
  if (context != kContext) return -50;
  lookupSpecCount = 0;
  /* Take every lookup dictionary: these describe the printers worth showing. */
  for (uint32_t i = 0; callbacks && callbacks->getLookupSpec && i < numLookupSpecs; ++i) {
    QrDictionaryRef lookup = NULL;
    if (callbacks->getLookupSpec(refCon, i, &lookup) == 0 && lookup) ++lookupSpecCount;
    QrRelease(lookup);
  }
  return 0;
}

static int32_t GetSelectedPrinters(uint32_t context, QrArrayRef* printers) {
  if (context != kContext || !printers) return -50;
  static QrMutableArrayRef none; /* nothing is ever selected without a pane */
  if (!none) none = QrArrayCreateMutable();
  *printers = none;
  return 0;
}

static int32_t Sync(uint32_t context) { return context == kContext ? 0 : -50; }

static int32_t Terminate(uint32_t context, int32_t status) {
  (void)status;
  return context == kContext ? 0 : -50;
}

static const QrBrowserModuleVTbl kBrowserModuleTable = {
    NULL, NULL, NULL, NULL, GetSelectedPrinters, Initialize, Prologue, NULL, Sync, Terminate};

/* A browser module's interface is its table itself. */
static SampleInstance instance = {.interfaceID = QR_PBM_INTERFACE_ID,
                                  .interface = (void*)&kBrowserModuleTable};

__attribute__((constructor)) static void loaded(void) { sample_note_load(); }

SAMPLE_EXPORT void* SampleBrowserModuleFactory(void* allocator, QrUUIDRef typeID) {
  (void)allocator;
  return sample_instance(&instance, typeID, QR_PBM_TYPE_ID);
}
