#include "modules/module.h"

#include "cache/failure_memory.h"
#include "cache/module_cache.h"
#include "modules/module_factory.h"
#include "modules/plugin_guard.h"
#include "platform/log.h"

namespace qr {

QuarrinModule::QuarrinModule(Ref<PlugIn> plugin, const Array* factories, Ref<URL> path)
    : _pluginURL(std::move(path)), _pluginRef(std::move(plugin)) {
  if (factories && !factories->isEmpty()) _factoryID = cast<UUID>(factories->at(0));
}

std::optional<std::string> QuarrinModule::callPlugin(const std::function<void()>& call) {
  if (_lost) return std::nullopt;
  try {
    auto raised = guardPluginCall(call);
    FailureMemory::shared().forget(*_pluginURL);  // it answered
    return raised;
  } catch (const PluginCallLost& lost) {
    std::string what = "[" + lost.what + "] on call to '" + lost.entry + "'";
    log("%s for '%@'", what, _pluginURL);
    _lost = true;
    _interface = 0;
    FailureMemory::shared().remember(*_pluginRef, what);
    // Whatever it answered before does not stand for a module that fails.
    QuarrinModuleCache::defaultCache().removeEntry(_pluginURL.get());
    return std::nullopt;
  }
}

bool QuarrinModule::loadPluginInterface() {
  UUID* type = typeID();
  UUID* interface = interfaceID();
  if (_loadAttempted || _interface || !_factoryID || !type || !interface) return _interface != 0;
  _loadAttempted = true;

  if (auto failure = FailureMemory::shared().standingFailure(*_pluginRef)) {
    log("Skipping '%@': %s in an earlier run, and it has not changed since", _pluginURL, *failure);
    QuarrinModuleFactory::countLoadFailure();
    return false;
  }
  PluginRunner& calls = runner();
  PluginHandle instance = 0;
  auto raised = callPlugin([&] {
    instance = calls.createInstance(*_pluginRef, *_factoryID, *type);
    if (!instance) return;
    int32_t result = calls.queryInterface(instance, *interface, &_interface);
    if (result < 0) {
      auto bits = static_cast<uint32_t>(result);
      log("Unble to obtain interface[%@:(%@,%@)]: code:%d facility:%d severity:%d", _pluginURL,
          type->string(), interface->string(), static_cast<int>(bits & 0xFFFF),
          static_cast<int>((bits >> 16) & 0x1FFF), static_cast<int>(bits >> 31));
    }
  });
  if (raised) {
    _interface = 0;
    log("[%@] creating an interface for '%@'", *raised, _pluginURL);
  }
  if (instance && !_lost) {
    if (auto releaseRaised = callPlugin([&] { calls.releaseInstance(instance); }))
      log("[%@] creating an interface for '%@'", *releaseRaised, _pluginURL);
  }
  if (!_interface) QuarrinModuleFactory::countLoadFailure();
  return _interface != 0;
}

}  // namespace qr
