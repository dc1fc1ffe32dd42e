/* The C interface for Quarrin plug-in authors.
 *
 * A plug-in is a bundle directory (usually "<Name>.plugin"):
 *
 *   Contents/Info.plist          CFBundleExecutable, CFPlugInFactories, CFPlugInTypes
 *   Contents/Linux/<executable>  the shared object built against this header
 *   Contents/Resources/...
 *
 * CFPlugInFactories maps factory UUID strings to the names of exported
 * functions of type QrPlugInFactoryFunction; CFPlugInTypes maps plug-in type
 * UUID strings to arrays of factory UUID strings, in the order they are tried.
 *
 * Build a plug-in with
 *
 *   cc -shared -fPIC -fexceptions my_plugin.c -o MyPlugin.so \
 *      $(pkg-config --cflags --libs quarrin-plugin)
 *
 * or, with CMake, find_package(Quarrin) and link Quarrin::quarrin. Code that
 * calls QrRaise must be compiled with -fexceptions (C) so that the raised
 * exception can unwind through its frames; C++ plug-ins need nothing extra.
 *
 * Ownership: a function whose name contains Create or Copy hands the caller
 * one reference, to be given back with QrRelease (or free() for
 * QrStringCopyUTF8). Every other function lends its result: it stays valid as
 * long as the object it came from. Every function accepts NULL handles and
 * handles of the wrong kind without crashing: it does nothing and returns
 * NULL, 0 or false.
 */
#ifndef QUARRIN_PLUGIN_H
#define QUARRIN_PLUGIN_H

#include <stdbool.h>
#include <stddef.h>
#include <stdint.h>

#ifdef __cplusplus
extern "C" {
#endif

#if defined(__GNUC__) || defined(__clang__)
#define QR_API __attribute__((visibility("default")))
#define QR_NORETURN __attribute__((noreturn))
#else
#define QR_API
#define QR_NORETURN
#endif

/* ---- Values ---------------------------------------------------------- */

/* Any value. Every other handle converts to it without a cast. */
typedef const void* QrTypeRef;
typedef const struct QrOpaqueString* QrStringRef;
typedef const struct QrOpaqueArray* QrArrayRef;
typedef struct QrOpaqueArray* QrMutableArrayRef;
typedef const struct QrOpaqueDictionary* QrDictionaryRef;
typedef struct QrOpaqueDictionary* QrMutableDictionaryRef;
typedef const struct QrOpaqueData* QrDataRef;
typedef const struct QrOpaqueNumber* QrNumberRef;
typedef const struct QrOpaqueBoolean* QrBooleanRef;
typedef const struct QrOpaqueUUID* QrUUIDRef;

/* What a value is, for values read from property lists and collections. */
typedef enum QrValueKind {
  QR_KIND_NONE = 0, /* a NULL handle */
  QR_KIND_OTHER,
  QR_KIND_STRING,
  QR_KIND_NUMBER,
  QR_KIND_BOOLEAN,
  QR_KIND_DATA,
  QR_KIND_DATE,
  QR_KIND_ARRAY,
  QR_KIND_DICTIONARY,
  QR_KIND_URL,
  QR_KIND_UUID
} QrValueKind;

/* Returns its argument with one more reference. */
QR_API QrTypeRef QrRetain(QrTypeRef value);
QR_API void QrRelease(QrTypeRef value);
/* Value equality; two NULLs are equal. */
QR_API bool QrEqual(QrTypeRef a, QrTypeRef b);
QR_API QrValueKind QrGetKind(QrTypeRef value);

/* NULL when the text is not well-formed UTF-8. */
QR_API QrStringRef QrStringCreateWithUTF8(const char* utf8);
/* A malloc'ed, NUL-terminated UTF-8 copy that the caller frees. */
QR_API char* QrStringCopyUTF8(QrStringRef string);
/* The length in UTF-16 code units. */
QR_API size_t QrStringGetLength(QrStringRef string);

QR_API QrMutableArrayRef QrArrayCreateMutable(void);
/* The array keeps its own reference; NULL values are not stored. */
QR_API void QrArrayAppendValue(QrMutableArrayRef array, QrTypeRef value);
QR_API size_t QrArrayGetCount(QrArrayRef array);
/* NULL past the end. */
QR_API QrTypeRef QrArrayGetValueAtIndex(QrArrayRef array, size_t index);

QR_API QrMutableDictionaryRef QrDictionaryCreateMutable(void);
/* Adds or replaces; the dictionary keeps its own references. A NULL key or
 * value changes nothing. */
QR_API void QrDictionarySetValue(QrMutableDictionaryRef dictionary, QrTypeRef key, QrTypeRef value);
QR_API QrTypeRef QrDictionaryGetValue(QrDictionaryRef dictionary, QrTypeRef key);
QR_API size_t QrDictionaryGetCount(QrDictionaryRef dictionary);

QR_API QrNumberRef QrNumberCreateInt64(int64_t value);
QR_API QrNumberRef QrNumberCreateDouble(double value);
/* Stores the value (reals truncated toward zero) and returns whether it
 * fits an int64_t exactly. */
QR_API bool QrNumberGetInt64(QrNumberRef number, int64_t* value);

/* The two boolean values; they live for the whole process. */
QR_API QrBooleanRef QrBooleanGetTrue(void);
QR_API QrBooleanRef QrBooleanGetFalse(void);

/* Copies the bytes. bytes may be NULL only when length is 0. */
QR_API QrDataRef QrDataCreate(const uint8_t* bytes, size_t length);
QR_API const uint8_t* QrDataGetBytes(QrDataRef data);
QR_API size_t QrDataGetLength(QrDataRef data);

/* Reads an XML, binary or text-format property list; NULL on any failure.
 * The result and everything in it is immutable. */
QR_API QrTypeRef QrPropertyListCreateFromFile(const char* path);

/* ---- UUIDs ----------------------------------------------------------- */

/* The 16 bytes of a UUID in the order of its text form. */
typedef struct QrUUIDBytes {
  uint8_t bytes[16];
} QrUUIDBytes;

/* "XXXXXXXX-XXXX-XXXX-XXXX-XXXXXXXXXXXX" in either case; NULL if malformed. */
QR_API QrUUIDRef QrUUIDCreateFromString(const char* text);
QR_API QrUUIDRef QrUUIDCreateFromBytes(QrUUIDBytes bytes);
/* All zero for NULL. */
QR_API QrUUIDBytes QrUUIDGetBytes(QrUUIDRef uuid);

#define QR_PM_TYPE_ID "5D69ED5E-D5B5-11D3-9EFF-00050209D9C1"
#define QR_PM_INTERFACE_ID "5EDEC4FA-D5B5-11D3-AAF2-00050209D9C1"
#define QR_IOM_TYPE_ID "EE5A5E5C-C2DD-11D3-84B5-00050209D9C1"
#define QR_IOM_INTERFACE_ID "F4F7510C-C2DD-11D3-93A5-00050209D9C1"
#define QR_PBM_TYPE_ID "23F71E46-95CC-1226-AC04-000502ADB00B"
#define QR_PBM_VERSION_ID "1D6BF822-95D0-1226-A8ED-000502ADB00B"
#define QR_PBM_INTERFACE_ID "86544C22-95D0-1226-91D5-000502ADB00B"

/* ---- Errors ---------------------------------------------------------- */

/* Raises the platform exception (name, reason) from plug-in code; the host
 * catches it at the call into the plug-in. Never returns. C code that raises
 * must be built with -fexceptions. */
QR_API QR_NORETURN void QrRaise(const char* name, const char* reason);

/* ---- Instances and interfaces ---------------------------------------- */

#define QR_S_OK ((int32_t)0)
/* QueryInterface's answer for an interface the instance does not offer. */
#define QR_E_NOINTERFACE ((int32_t)0x80000004)

/* A factory named in CFPlugInFactories. allocator is always NULL. Returns an
 * instance carrying one reference for the caller, or NULL. */
typedef void* (*QrPlugInFactoryFunction)(void* allocator, QrUUIDRef typeID);

/* An instance is a pointer to an object whose first member points to a
 * QrIUnknownVTbl:
 *
 *   typedef struct { const QrIUnknownVTbl *vtbl; uint32_t refs; } MyInstance;
 *
 * QueryInterface stores the interface for iid in *out and returns QR_S_OK, or
 * stores NULL and returns QR_E_NOINTERFACE (any negative value is a failure).
 * The host calls QueryInterface once and Release once per instance and keeps
 * the interface for the rest of the process. */
typedef struct QrIUnknownVTbl {
  void* reserved;
  int32_t (*QueryInterface)(void* instance, QrUUIDBytes iid, void** out);
  uint32_t (*AddRef)(void* instance);
  uint32_t (*Release)(void* instance);
} QrIUnknownVTbl;

/* The I/O module interface (QR_IOM_INTERFACE_ID): a pointer to an object
 * whose first member points to this table. Entries 0-2 are never called.
 * GetConnectionInfo fills either, both or neither reference and returns 0 on
 * success; the strings stay the plug-in's (the host takes its own reference). */
typedef struct QrIOModuleVTbl {
  void* reserved0;
  void* reserved1;
  void* reserved2;
  int32_t (*GetConnectionInfo)(QrStringRef* connectionType, QrStringRef* pbmPath);
} QrIOModuleVTbl;

/* The printer module interface (QR_PM_INTERFACE_ID): a pointer to an object
 * whose first member points to this table. CreateBrowserInfo sets *browserInfo
 * to NULL or to a new array of browser-info dictionaries, which the caller
 * releases. Its result is not looked at. */
typedef struct QrPrinterModuleVTbl {
  void* reserved0;
  void* reserved1;
  void* reserved2;
  int32_t (*CreateBrowserInfo)(QrStringRef connectionType, QrArrayRef* browserInfo);
} QrPrinterModuleVTbl;

/* Hands out lookup dictionary `index` (from 0) of the browser's connection type as
 * a new dictionary that the browser releases. refCon is the value the
 * browser received in Initialize. Returns 0 or a negative status. */
typedef int32_t (*PMPrBrowserGetLookupSpecProc)(void* refCon, uint32_t index,
                                                QrDictionaryRef* lookupSpec);
/* The client's own functions: the host only stores them, so their use is an
 * agreement between a browser and its client. */
typedef int32_t (*PMPrBrowserSyncRequestProc)(void* refCon);
typedef int32_t (*PMPrBrowserSelStatusProc)(void* refCon, bool printersSelected);

/* Given to the browser's Initialize entry; lives until the module goes away. */
typedef struct PMPrBrowserCallbacks {
  int32_t version; /* 1 */
  PMPrBrowserGetLookupSpecProc getLookupSpec;
  PMPrBrowserSyncRequestProc syncRequest; /* may be NULL */
  PMPrBrowserSelStatusProc selStatus;     /* may be NULL */
} PMPrBrowserCallbacks;

/* The printer browser module interface (QR_PBM_INTERFACE_ID) points straight
 * at this table, not at an object holding it. Every entry returns a status
 * that the host passes on unchanged; context is the value Prologue stored.
 * Entries marked reserved are never called. */
typedef struct QrBrowserModuleVTbl {
  void* reserved0;
  void* reserved1;
  void* reserved2;
  void* reserved3;
  /* Sets *printers to the selected printers. */
  int32_t (*GetSelectedPrinters)(uint32_t context, QrArrayRef* printers);
  /* refCon goes back to callbacks->getLookupSpec; userPane is the client's
   * opaque pane; numLookupSpecs counts the dictionaries getLookupSpec serves. */
  int32_t (*Initialize)(uint32_t context, void* refCon, const PMPrBrowserCallbacks* callbacks,
                        void* userPane, uint32_t numLookupSpecs);
  /* Stores the browser's context, its title (which stays the browser's, as
   * with GetConnectionInfo) and the pane's size limits. A host that wants
   * only the title passes flags 1. */
  int32_t (*Prologue)(uint32_t* context, uint32_t flags, QrStringRef* title, uint32_t* minH,
                      uint32_t* minV, uint32_t* maxH, uint32_t* maxV);
  void* reserved7;
  int32_t (*Sync)(uint32_t context);
  int32_t (*Terminate)(uint32_t context, int32_t status);
} QrBrowserModuleVTbl;

#ifdef __cplusplus
} /* extern "C" */
#endif

#endif /* QUARRIN_PLUGIN_H */
