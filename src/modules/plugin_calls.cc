#include "modules/plugin_calls.h"

#include <quarrin/plugin.h>

#include <cstring>

namespace qr::plugin_calls {
namespace {

template <class VTable>
const VTable* tableOf(void* object) {
  return *static_cast<const VTable* const*>(object);
}

Ref<String> adoptString(QrStringRef ref, bool owned) {
  auto* object = reinterpret_cast<Object*>(const_cast<QrOpaqueString*>(ref));
  if (!object) return nullptr;
  Ref<Object> held = owned ? Ref<Object>::adopt(object) : Ref<Object>(object);
  return cast<String>(held);
}

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
      *typeOut = adoptString(type, false);
      *pathOut = adoptString(path, false);
    }
  } deliver{type, path, connectionType, pbmPath};
  return tableOf<QrIOModuleVTbl>(interface)->GetConnectionInfo(&type, &path);
}

Ref<Array> createBrowserInfo(void* interface, const String& connectionType) {
  QrArrayRef info = nullptr;
  auto type = reinterpret_cast<QrStringRef>(static_cast<const Object*>(&connectionType));
  tableOf<QrPrinterModuleVTbl>(interface)->CreateBrowserInfo(type, &info);
  auto* object = reinterpret_cast<Object*>(const_cast<QrOpaqueArray*>(info));
  if (!object) return nullptr;
  return cast<Array>(Ref<Object>::adopt(object));
}

}  // namespace qr::plugin_calls
