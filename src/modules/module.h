// The common base of the three module kinds: one plug-in bundle, its chosen
// factory, and the interface obtained from it at most once.
#pragma once

#include "bundles/plugin_model.h"
#include "values/array.h"
#include "values/object.h"
#include "values/url.h"
#include "values/uuid.h"

namespace qr {

class QuarrinModule : public Object {
 public:
  // initWithPlugin:factories:path: the first factory is the one used; the
  // array itself is not kept.
  QuarrinModule(Ref<PlugIn> plugin, const Array* factories, Ref<URL> path);

  const Ref<URL>& pluginURL() const noexcept { return _pluginURL; }
  PlugIn* pluginRef() const noexcept { return _pluginRef.get(); }
  UUID* factoryID() const noexcept { return _factoryID.get(); }
  void* pluginInterface() const noexcept { return _pluginInterface; }

  virtual UUID* typeID() const { return nullptr; }
  virtual UUID* interfaceID() const { return nullptr; }

  bool interfaceLoaded() const noexcept { return _pluginInterface != nullptr; }
  // Obtains the interface on the first call whose preconditions hold; true
  // when the module has one. Each module creates at most one instance, makes
  // at most one QueryInterface call and releases the instance once.
  bool loadPluginInterface();

 private:
  Ref<URL> _pluginURL;
  Ref<UUID> _factoryID;
  Ref<PlugIn> _pluginRef;
  void* _pluginInterface = nullptr;
  bool _loadAttempted = false;
};

}  // namespace qr
