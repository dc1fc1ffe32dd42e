// Instances made through the component model and called the way a module
// host calls them: through the function tables of <quarrin/plugin.h>.
#pragma once

#include <quarrin/plugin.h>

#include <cstring>
#include <string>

#include "bundles/plugin_model.h"

namespace qrtest {

inline const QrIUnknownVTbl* unknownTable(void* instance) {
  return *static_cast<const QrIUnknownVTbl**>(instance);
}

inline int32_t queryInterface(void* instance, const char* interfaceID, void** out) {
  QrUUIDBytes iid;
  std::memcpy(iid.bytes, qr::UUID::fromString(interfaceID)->bytes().data(), 16);
  return unknownTable(instance)->QueryInterface(instance, iid, out);
}

inline uint32_t release(void* instance) { return unknownTable(instance)->Release(instance); }

inline void* createInstance(const std::string& bundle, const char* factory, const char* type) {
  auto plugin = qr::PlugIn::create(*qr::URL::fileURL(bundle, true));
  if (!plugin) return nullptr;
  return plugin->createInstance(*qr::UUID::fromString(factory), *qr::UUID::fromString(type));
}

// The interface of a fresh instance, which the interface then keeps alive.
inline void* interfaceOf(const std::string& bundle, const char* factory, const char* type,
                         const char* interfaceID) {
  void* instance = createInstance(bundle, factory, type);
  if (!instance) return nullptr;
  void* interface = nullptr;
  queryInterface(instance, interfaceID, &interface);
  release(instance);
  return interface;
}

}  // namespace qrtest
