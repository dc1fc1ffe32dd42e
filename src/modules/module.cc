#include "modules/module.h"

#include "modules/module_factory.h"
#include "modules/plugin_calls.h"
#include "modules/plugin_guard.h"
#include "platform/log.h"

namespace qr {

QuarrinModule::QuarrinModule(Ref<PlugIn> plugin, const Array* factories, Ref<URL> path)
    : _pluginURL(std::move(path)), _pluginRef(std::move(plugin)) {
  if (factories && !factories->isEmpty()) _factoryID = cast<UUID>(factories->at(0));
}

bool QuarrinModule::loadPluginInterface() {
  UUID* type = typeID();
  UUID* interface = interfaceID();
  if (_loadAttempted || _pluginInterface || !_factoryID || !type || !interface)
    return _pluginInterface != nullptr;

  void* instance = nullptr;
  auto raised = guardPluginCall([&] {
    instance = _pluginRef->createInstance(*_factoryID, *type);
    if (!instance) return;
    int32_t result = plugin_calls::queryInterface(instance, *interface, &_pluginInterface);
    if (result < 0) {
      auto bits = static_cast<uint32_t>(result);
      log("Unble to obtain interface[%@:(%@,%@)]: code:%d facility:%d severity:%d", _pluginURL,
          type->string(), interface->string(), static_cast<int>(bits & 0xFFFF),
          static_cast<int>((bits >> 16) & 0x1FFF), static_cast<int>(bits >> 31));
    }
  });
  if (raised) {
    _pluginInterface = nullptr;
    log("[%@] creating an interface for '%@'", *raised, _pluginURL);
  }
  if (instance) {
    if (auto releaseRaised = guardPluginCall([&] { plugin_calls::releaseInstance(instance); }))
      log("[%@] creating an interface for '%@'", *releaseRaised, _pluginURL);
  }
  if (!_pluginInterface) QuarrinModuleFactory::countLoadFailure();
  _loadAttempted = true;
  return _pluginInterface != nullptr;
}

}  // namespace qr
