#include "modules/plugin_calls.h"

#include <quarrin/plugin.h>

#include <cstring>
#include <utility>

#include "bundles/c_bridge.h"

namespace qr::plugin_calls {
namespace {

template <class VTable>
const VTable* tableOf(void* object) {
  return *static_cast<const VTable* const*>(object);
}

// The plug-in keeps its strings; the caller takes its own reference.
Ref<String> lentString(QrStringRef ref) { return Ref<String>(fromCAs<String>(ref)); }

}  // namespace

int32_t queryInterface(void* instance, const UUID& interfaceID, void** out) {
  QrUUIDBytes bytes;
  std::memcpy(&bytes, interfaceID.bytes().data(), sizeof bytes);
  return tableOf<QrIUnknownVTbl>(instance)->QueryInterface(instance, bytes, out);
}

void releaseInstance(void* instance) { tableOf<QrIUnknownVTbl>(instance)->Release(instance); }

int32_t getConnectionInfo(void* interface, Ref<String>* connectionType, Ref<String>* pbmPath) {
  QrStringRef type = nullptr, path = nullptr;
  // What the plug-in stored before raising still reaches the caller.
  struct Deliver {
    QrStringRef& type;
    QrStringRef& path;
    Ref<String>* typeOut;
    Ref<String>* pathOut;
    ~Deliver() {
      *typeOut = lentString(type);
      *pathOut = lentString(path);
    }
  } deliver{type, path, connectionType, pbmPath};
  return tableOf<QrIOModuleVTbl>(interface)->GetConnectionInfo(&type, &path);
}

Ref<Array> createBrowserInfo(void* interface, const String& connectionType) {
  QrArrayRef info = nullptr;
  // The array is the caller's even when the plug-in raises after handing it out.
  struct TakeOver {
    QrArrayRef& info;
    Ref<Array> taken;
    ~TakeOver() {
      if (info) taken = adoptFromC<Array>(std::exchange(info, nullptr));
    }
  } takeOver{info, nullptr};
  tableOf<QrPrinterModuleVTbl>(interface)->CreateBrowserInfo(toC<QrStringRef>(&connectionType),
                                                             &info);
  return adoptFromC<Array>(std::exchange(info, nullptr));
}

}  // namespace qr::plugin_calls
