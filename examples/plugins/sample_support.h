/* What every sample plug-in needs to know about itself: where its bundle is,
 * and, for the demo, a note each time its code is loaded. */
#ifndef QUARRIN_SAMPLE_SUPPORT_H
#define QUARRIN_SAMPLE_SUPPORT_H

#include <dlfcn.h>
#include <fcntl.h>
#include <quarrin/plugin.h>
#include <stdio.h>
#include <stdlib.h>
#include <string.h>
#include <unistd.h>

#define SAMPLE_EXPORT __attribute__((visibility("default")))

/* The bundle directory of this shared object (<bundle>/Contents/Linux/<file>),
 * or NULL when it cannot be told. Found once and kept: finding it walks the
 * list of every loaded shared object. */
static inline const char* sample_bundle_path(void) {
  static char* path;
  static bool found;
  if (found) return path;
  found = true;
  Dl_info info;
  if (!dladdr((void*)&sample_bundle_path, &info) || !info.dli_fname) return NULL;
  path = strdup(info.dli_fname);
  for (int i = 0; path && i < 3; ++i) {
    char* slash = strrchr(path, '/');
    if (!slash) {
      free(path);
      path = NULL;
      break;
    }
    *slash = '\0';
  }
  return path;
}

/* "<bundle>/Contents/Resources/<name>", malloc'ed, or NULL. */
static inline char* sample_resource_path(const char* name) {
  const char* bundle = sample_bundle_path();
  if (!bundle) return NULL;
  size_t size = strlen(bundle) + strlen(name) + sizeof "/Contents/Resources/";
  char* path = malloc(size);
  if (path) snprintf(path, size, "%s/Contents/Resources/%s", bundle, name);
  return path;
}

/* Appends the bundle's name ("Foo" for .../Foo.plugin) as one line to the file
 * named by QUARRIN_SAMPLE_TRACE, when that is set: the demo lists what a run
 * had to load. One write with O_APPEND, so concurrent loads never mix lines. */
static inline void sample_note_load(void) {
  const char* trace = getenv("QUARRIN_SAMPLE_TRACE");
  const char* bundle = trace && *trace ? sample_bundle_path() : NULL;
  if (!bundle) return;
  const char* name = strrchr(bundle, '/');
  name = name ? name + 1 : bundle;
  size_t length = strcspn(name, ".");
  int fd = open(trace, O_WRONLY | O_APPEND | O_CREAT | O_CLOEXEC, 0644);
  if (fd >= 0) {
    char line[256];
    int n = snprintf(line, sizeof line, "%.*s\n", (int)length, name);
    if (n > 0 && (size_t)n < sizeof line && write(fd, line, (size_t)n) < 0) {
      /* a lost note only makes the demo's listing shorter */
    }
    close(fd);
  }
}

/* ---- Instances ---------------------------------------------------------
 * Each sample offers one interface of one plug-in type through one instance
 * that lives as long as the process: the host keeps the interface it obtains
 * for good, so there is nothing to free. The count is kept all the same, as
 * the component model asks. */

typedef struct SampleInstance {
  const QrIUnknownVTbl* vtbl;
  uint32_t refs;
  const char* interfaceID;
  void* interface;
} SampleInstance;

static inline bool sample_uuid_is(QrUUIDRef uuid, const char* text) {
  QrUUIDRef other = QrUUIDCreateFromString(text);
  bool same = QrEqual(uuid, other);
  QrRelease(other);
  return same;
}

static inline int32_t sample_query_interface(void* self, QrUUIDBytes iid, void** out) {
  SampleInstance* instance = self;
  QrUUIDRef wanted = QrUUIDCreateFromBytes(iid);
  bool offered = sample_uuid_is(wanted, instance->interfaceID);
  QrRelease(wanted);
  if (!offered) {
    *out = NULL;
    return QR_E_NOINTERFACE;
  }
  ++instance->refs;
  *out = instance->interface;
  return QR_S_OK;
}

static inline uint32_t sample_add_ref(void* self) { return ++((SampleInstance*)self)->refs; }

static inline uint32_t sample_release(void* self) { return --((SampleInstance*)self)->refs; }

static const QrIUnknownVTbl kSampleInstanceTable = {NULL, sample_query_interface, sample_add_ref,
                                                    sample_release};

/* The instance, with one more reference, when typeID is the plug-in type
 * this sample implements; NULL otherwise. */
static inline void* sample_instance(SampleInstance* instance, QrUUIDRef typeID,
                                    const char* pluginType) {
  if (!sample_uuid_is(typeID, pluginType)) return NULL;
  instance->vtbl = &kSampleInstanceTable;
  ++instance->refs;
  return instance;
}

#endif
