// The common base of the three module kinds: one plug-in bundle, its chosen
// factory, and the interface obtained from it at most once.
#pragma once

#include <functional>
#include <optional>
#include <string>

#include "bundles/plugin_model.h"
#include "modules/plugin_runner.h"
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
  // The interface pointer; only meaningful for modules run in this process.
  void* pluginInterface() const noexcept { return reinterpret_cast<void*>(_interface); }

  virtual UUID* typeID() const { return nullptr; }
  virtual UUID* interfaceID() const { return nullptr; }

  bool interfaceLoaded() const noexcept { return _interface != 0; }
  // Obtains the interface on the first call whose preconditions hold; true
  // when the module has one. Each module creates at most one instance, makes
  // at most one QueryInterface call and releases the instance once.
  // followUp is what the caller asks next when the load succeeds.
  bool loadPluginInterface(const FollowUp* followUp = nullptr);
  // A call into the plug-in never came back; it is not called again.
  bool lost() const noexcept { return _lost; }

 protected:
  PluginHandle interfaceHandle() const noexcept { return _interface; }
  virtual PluginRunner& runner() const { return PluginRunner::current(); }
  // Runs a call into the plug-in. A raised platform exception comes back by
  // name for the caller to report; a call that never came back is reported
  // here, and the module is remembered as failed and recorded nothing.
  std::optional<std::string> callPlugin(const std::function<void()>& call);

 private:
  Ref<URL> _pluginURL;
  Ref<UUID> _factoryID;
  Ref<PlugIn> _pluginRef;
  PluginHandle _interface = 0;
  bool _loadAttempted = false;
  bool _lost = false;
  bool _answered = false;
};

}  // namespace qr
